// String hashes.
#include <climits>
#include <cstring>
#include <memory>
#include <new>

#include "common/appliance.h"
#include "core/containers.h"
#include "core/internal.h"

using namespace xavo::platform;
using xavo::core::HashOf;

namespace {
constexpr char kUnit[] = "sz_containers";

constexpr int32_t kMinHashCapacity = 16;

// The next capacity of a growing vector: doubling keeps n inserts at O(n).
size_t GrownCapacity(size_t n) { return n < 8 ? 16 : 2 * n; }

}  // namespace

// Insertion-ordered, so that a section written back from a hash keeps the
// order its keys were read in and files change only where they must.
// Texts are separate allocations: growing the hash moves only pointers, so a
// value the caller holds stays valid until its own key changes.
struct ORLICSzHash {
    struct Entry {
        std::unique_ptr<char[]> key;
        std::unique_ptr<char[]> value;
    };
    int32_t capacity = 0;
    std::vector<Entry> entries;
    std::vector<int32_t> slots;  // open addressing: -1 free, else index into entries

    int32_t Find(std::string_view key) const {
        if (slots.empty()) return -1;
        size_t mask = slots.size() - 1;
        for (size_t i = HashOf(key) & mask;; i = (i + 1) & mask) {
            int32_t idx = slots[i];
            if (idx < 0) return -1;
            if (key == entries[static_cast<size_t>(idx)].key.get()) return idx;
        }
    }

    // The slot table is allocated before anything changes, so that a
    // failing allocation leaves the hash whole.
    std::vector<int32_t> NewSlots(size_t nEntries) const {
        size_t n = 16;
        while (n < 2 * (nEntries + 1) || n < static_cast<size_t>(capacity)) n *= 2;
        return std::vector<int32_t>(n, -1);
    }

    void Index(std::vector<int32_t> fresh) {
        size_t mask = fresh.size() - 1;
        for (size_t idx = 0; idx < entries.size(); ++idx) {
            size_t i = HashOf(entries[idx].key.get()) & mask;
            while (fresh[i] >= 0) i = (i + 1) & mask;
            fresh[i] = static_cast<int32_t>(idx);
        }
        slots = std::move(fresh);
    }

    void Reindex() { Index(NewSlots(entries.size())); }
};

namespace xavo::core {

ORLICSzHash *NewHash(int32_t iCapacity) {
    if (iCapacity < 0) return nullptr;
    try {
        auto h = std::make_unique<ORLICSzHash>();
        h->capacity = iCapacity < kMinHashCapacity ? kMinHashCapacity : iCapacity;
        h->Reindex();
        return h.release();
    } catch (...) {
        return nullptr;
    }
}

void HashSet(ORLICSzHash **ppHash, std::string_view key, std::string_view value) {
    auto copy = [](std::string_view text) {
        std::unique_ptr<char[]> p(new char[text.size() + 1]);
        std::memcpy(p.get(), text.data(), text.size());
        p[text.size()] = '\0';
        return p;
    };
    ORLICSzHash *h = *ppHash;
    int32_t idx = h->Find(key);
    if (idx >= 0) {
        h->entries[static_cast<size_t>(idx)].value = copy(value);
        return;
    }
    ORLICSzHash::Entry entry{copy(key), copy(value)};
    if (h->entries.size() >= static_cast<size_t>(h->capacity)) {
        if (h->capacity > INT32_MAX / 2) throw std::bad_alloc();
        // Past its capacity the hash moves to a new record, as the
        // appliance's does; callers hand us the address of their pointer.
        auto grown = std::make_unique<ORLICSzHash>();
        grown->capacity = h->capacity * 2;
        std::vector<int32_t> fresh = grown->NewSlots(h->entries.size() + 1);
        grown->entries.reserve(GrownCapacity(h->entries.size()));
        // Nothing below allocates: the old hash stays whole until here.
        for (auto &e : h->entries) grown->entries.push_back(std::move(e));
        grown->entries.push_back(std::move(entry));
        grown->Index(std::move(fresh));
        delete h;
        *ppHash = grown.release();
        return;
    }
    std::vector<int32_t> fresh;
    if (2 * (h->entries.size() + 1) >= h->slots.size()) fresh = h->NewSlots(h->entries.size() + 1);
    // Room is made before anything changes (push_back below cannot throw),
    // and geometrically: reserving exactly one more would copy every entry
    // on every insert, and a hash of n keys would cost n * n.
    if (h->entries.size() == h->entries.capacity()) h->entries.reserve(GrownCapacity(h->entries.size()));
    h->entries.push_back(std::move(entry));
    if (!fresh.empty()) {
        h->Index(std::move(fresh));
        return;
    }
    size_t mask = h->slots.size() - 1;
    size_t i = HashOf(key) & mask;
    while (h->slots[i] >= 0) i = (i + 1) & mask;
    h->slots[i] = static_cast<int32_t>(h->entries.size() - 1);
}

const char *HashGet(const ORLICSzHash *pHash, std::string_view key) {
    int32_t idx = pHash->Find(key);
    return idx < 0 ? nullptr : pHash->entries[static_cast<size_t>(idx)].value.get();
}

std::vector<std::pair<const char *, const char *>> HashPairs(const ORLICSzHash *pHash) {
    std::vector<std::pair<const char *, const char *>> pairs;
    pairs.reserve(pHash->entries.size());
    for (const auto &e : pHash->entries) pairs.emplace_back(e.key.get(), e.value.get());
    return pairs;
}

}  // namespace xavo::core

using namespace xavo::core;

// ---- exported: string hashes ----

XAVO_PLATFORM_API ORLICSzHash *ORLICSzHashAlloc(int32_t iCapacity) {
    if (XAVO_INJECTED()) return nullptr;
    ORLICSzHash *p = NewHash(iCapacity);
    if (p == nullptr) SetError(iCapacity < 0 ? kErrBadParameters : kErrOutOfMemory, kUnit, __LINE__);
    return p;
}

XAVO_PLATFORM_API int32_t ORLICSzHashSetValue(ORLICSzHash **ppHash, const char *szKey, const char *szValue) {
    if (XAVO_INJECTED()) return -1;
    if (ppHash == nullptr || *ppHash == nullptr || szKey == nullptr || szValue == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        HashSet(ppHash, szKey, szValue);
        return int32_t{0};
    });
}

XAVO_PLATFORM_API const char *ORLICSzHashGetValue(const ORLICSzHash *pHash, const char *szKey) {
    Counted(__func__);
    if (pHash == nullptr || szKey == nullptr) return nullptr;
    return HashGet(pHash, szKey);
}

XAVO_PLATFORM_API int32_t ORLICSzHashRemoveKey(ORLICSzHash *pHash, const char *szKey) {
    if (XAVO_INJECTED()) return -1;
    if (pHash == nullptr || szKey == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        int32_t idx = pHash->Find(szKey);
        if (idx < 0) return int32_t{0};
        std::vector<int32_t> fresh = pHash->NewSlots(pHash->entries.size() - 1);
        pHash->entries.erase(pHash->entries.begin() + idx);
        pHash->Index(std::move(fresh));
        return int32_t{1};
    });
}

XAVO_PLATFORM_API int32_t ORLICSzHashEnumKey(const ORLICSzHash *pHash, ORLICSzList **ppList) {
    if (XAVO_INJECTED()) return -1;
    if (pHash == nullptr || ppList == nullptr || *ppList == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    int32_t before = (*ppList)->iCount;
    for (const auto &e : pHash->entries) {
        if (!ListPush(ppList, e.key.get())) {
            ListTruncate(*ppList, before);
            SetError(kErrOutOfMemory, kUnit, __LINE__);
            return -1;
        }
    }
    return static_cast<int32_t>(pHash->entries.size());
}

XAVO_PLATFORM_API void ORLICSzHashFree(ORLICSzHash *pHash) {
    Counted(__func__);
    delete pHash;
}
