// String lists (the hashes are in string_hash.cc).
#include "core/containers.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "common/appliance.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "sz_containers";

// The record's header: capacity, count and four words of our own, then the
// item pointers.  Callers read the count and the items straight from the
// record, so this layout is fixed (see xavocore.h).
constexpr size_t kListHeaderBytes = 6 * sizeof(int32_t);
static_assert(sizeof(ORLICSzList) == kListHeaderBytes, "string list header");
// A list created with capacity 0 gets room for this many items when it is
// first pushed to.
constexpr int32_t kMinListGrowth = 16;
// Slots a new list gets at most, whatever capacity it was asked for.
constexpr int32_t kInitialListSlots = 16;

size_t ListBytes(int32_t iCapacity) { return kListHeaderBytes + static_cast<size_t>(iCapacity) * sizeof(char *); }

char **Items(ORLICSzList *p) { return ORLIC_SZLIST_ITEMS(p); }

char *CopyText(std::string_view text) {
    auto *copy = static_cast<char *>(std::malloc(text.size() + 1));
    if (copy == nullptr) return nullptr;
    std::memcpy(copy, text.data(), text.size());
    copy[text.size()] = '\0';
    return copy;
}

}  // namespace

namespace xavo::core {

ORLICSzList *NewList(int32_t iCapacity) {
    if (iCapacity < 0 || static_cast<size_t>(iCapacity) > (SIZE_MAX - kListHeaderBytes) / sizeof(char *)) {
        return nullptr;
    }
    auto *p = static_cast<ORLICSzList *>(std::calloc(1, ListBytes(iCapacity)));
    if (p != nullptr) p->iCapacity = iCapacity;
    return p;
}

bool ListPush(ORLICSzList **ppList, std::string_view text) {
    ORLICSzList *p = *ppList;
    char *copy = CopyText(text);
    if (copy == nullptr) return false;
    if (p->iCount >= p->iCapacity) {
        if (p->iCapacity > INT32_MAX / 2) {
            std::free(copy);
            return false;
        }
        int32_t grown = p->iCapacity < kMinListGrowth / 2 ? kMinListGrowth : p->iCapacity * 2;
        // Always a new block, never realloc() in place: a caller that kept
        // the old list pointer instead of the one stored back fails at once
        // under the sanitizers instead of working by luck.
        ORLICSzList *q = NewList(grown);
        if (q == nullptr) {
            std::free(copy);
            return false;
        }
        std::memcpy(q, p, ListBytes(p->iCount));
        q->iCapacity = grown;
        std::free(p);
        p = q;
        *ppList = q;
    }
    Items(p)[p->iCount++] = copy;
    return true;
}

void ListTruncate(ORLICSzList *pList, int32_t iCount) {
    while (pList->iCount > iCount) {
        --pList->iCount;
        std::free(Items(pList)[pList->iCount]);
        Items(pList)[pList->iCount] = nullptr;
    }
}

}  // namespace xavo::core

using namespace xavo::core;

// ---- exported: string lists ----

XAVO_PLATFORM_API ORLICSzList *ORLICSzListAlloc(int32_t iCapacity) {
    if (XAVO_INJECTED()) return nullptr;
    // The capacity asked for is a hint: callers ask for 1024 slots for
    // lists that mostly hold a handful of fields (one list per table line),
    // and clearing 8 KiB for each would cost more than the line's work.
    // The list starts small and grows as items are pushed.
    ORLICSzList *p = NewList(iCapacity < 0 ? iCapacity : std::min(iCapacity, kInitialListSlots));
    if (p == nullptr) SetError(iCapacity < 0 ? kErrBadParameters : kErrOutOfMemory, kUnit, __LINE__);
    return p;
}

XAVO_PLATFORM_API int32_t ORLICSzListPush(ORLICSzList **ppList, const char *sz) {
    if (XAVO_INJECTED()) return -1;
    if (ppList == nullptr || *ppList == nullptr || sz == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    if (!ListPush(ppList, sz)) {
        SetError(kErrOutOfMemory, kUnit, __LINE__);
        return -1;
    }
    return (*ppList)->iCount;
}

XAVO_PLATFORM_API const char *ORLICSzListGet(const ORLICSzList *pList, int32_t iIndex) {
    Counted(__func__);
    if (pList == nullptr || iIndex < 0 || iIndex >= pList->iCount) return nullptr;
    return ORLIC_SZLIST_ITEMS(pList)[iIndex];
}

XAVO_PLATFORM_API void ORLICSzListFree(ORLICSzList *pList) {
    Counted(__func__);
    if (pList == nullptr) return;
    ListTruncate(pList, 0);
    std::free(pList);
}
