// Key-value files: one key="value" line per entry, the form of the USB
// printer table, the network printer table and the USB/IP status files.
//
// A key set twice reads as its last value, as a shell reading the file
// would see it; setting a key leaves exactly one line for it.  Writing
// changes only the key's line and replaces the file atomically, holding
// the file's write lock from the read on (replace_lock.h).
#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "common/replace_lock.h"
#include "common/text_files.h"
#include "core/containers.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "keyvalue_file";

// A key must read back as itself (see ParseKeyValueLine): no "=", no quote,
// no white space at its ends, not a comment.
bool KeyOk(const char *szKey) {
    if (szKey == nullptr) return false;
    std::string_view key(szKey);
    return !key.empty() && !HasControl(key) && key.find_first_of("=\"") == std::string_view::npos &&
           Trim(key) == key && key.front() != '#';
}

// Values are refused, not altered: they are device names, addresses and
// status texts that mean nothing once changed, and a quote or a line break
// would end the value early or forge a line of its own.
bool ValueOk(const char *szValue) {
    return szValue != nullptr && !HasControl(szValue) && std::strchr(szValue, '"') == nullptr;
}

bool IsKeyLine(std::string_view line, std::string_view key) {
    auto kv = ParseKeyValueLine(line);
    return kv && kv->key == key;
}

}  // namespace

XAVO_PLATFORM_API int32_t ORLICFileGetKeyValue(const char *szPath, const char *szKey, char *szBuf, int32_t cbBuf,
                                               uint32_t /*uFlags: no flag is defined; callers pass 0*/) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szKey == nullptr || szBuf == nullptr || cbBuf <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        std::string text;
        if (!LoadTextFile(szPath, false, &text, kUnit, __LINE__)) return int32_t{-1};
        std::optional<std::string> value;
        for (const std::string &line : SplitLines(text)) {
            auto kv = ParseKeyValueLine(line);
            if (kv && kv->key == szKey) value = std::string(kv->value);
        }
        if (!value) {
            SetError(kErrKeyNotFound, kUnit, __LINE__);
            return int32_t{-1};
        }
        return CopyValue(*value, szBuf, cbBuf);
    });
}

XAVO_PLATFORM_API int32_t ORLICFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue,
                                               const char *szLineFormat) {
    if (XAVO_INJECTED()) return -1;
    std::string line;
    if (szPath == nullptr || !KeyOk(szKey) || !ValueOk(szValue) ||
        !XAVO_GUARD(false, [&] { return FormatLine(szLineFormat, szKey, szValue, &line); })) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD_WRITE(szPath, int32_t{-1}, [&] {
        // A missing file is created: the USB printer table is gone after
        // every restart until its first entry is set.
        std::string text;
        if (!LoadTextFile(szPath, true, &text, kUnit, __LINE__)) return int32_t{-1};
        std::vector<std::string> lines = SplitLines(text);
        auto first = std::find_if(lines.begin(), lines.end(),
                                  [&](const std::string &l) { return IsKeyLine(l, szKey); });
        if (first == lines.end()) {
            if (!lines.empty() && lines.back().back() != '\n') lines.back().push_back('\n');
            lines.push_back(line);
        } else {
            *first = line;
            lines.erase(std::remove_if(first + 1, lines.end(),
                                       [&](const std::string &l) { return IsKeyLine(l, szKey); }),
                        lines.end());
        }
        return StoreTextFile(szPath, JoinLines(lines), kUnit) ? int32_t{0} : int32_t{-1};
    });
}

// The number of lines removed: 0 when the key (or the whole file) is not
// there, which is what the caller wanted and no failure.
XAVO_PLATFORM_API int32_t ORLICFileRemoveKey(const char *szPath, const char *szKey) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szKey == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD_WRITE(szPath, int32_t{-1}, [&] {
        std::string text;
        if (!LoadTextFile(szPath, true, &text, kUnit, __LINE__)) return int32_t{-1};
        std::vector<std::string> lines = SplitLines(text);
        auto kept = std::remove_if(lines.begin(), lines.end(), [&](const std::string &l) { return IsKeyLine(l, szKey); });
        auto removed = static_cast<int32_t>(lines.end() - kept);
        if (removed == 0) return int32_t{0};
        lines.erase(kept, lines.end());
        return StoreTextFile(szPath, JoinLines(lines), kUnit) ? removed : int32_t{-1};
    });
}

XAVO_PLATFORM_API int32_t ORLICFileGetPair(const char *szPath, ORLICSzHash **ppHash) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || ppHash == nullptr || *ppHash == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        std::string text;
        if (!LoadTextFile(szPath, false, &text, kUnit, __LINE__)) return int32_t{-1};
        // Collected first, so that a file that cannot be read leaves the
        // caller's hash as it was.  The pairs point into lines.
        std::vector<std::string> lines = SplitLines(text);
        std::vector<KeyValue> pairs;
        for (const std::string &line : lines) {
            if (auto kv = ParseKeyValueLine(line)) pairs.push_back(*kv);
        }
        for (const KeyValue &kv : pairs) xavo::core::HashSet(ppHash, kv.key, kv.value);
        return static_cast<int32_t>(pairs.size());
    });
}
