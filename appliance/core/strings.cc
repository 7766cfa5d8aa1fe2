// String helpers.
#include <cctype>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "common/text_files.h"
#include "core/containers.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "strings";
// First allocation of ORLICStrCat: most texts built with it (PPD files,
// program output) are kilobytes.
constexpr int32_t kMinCatAlloc = 256;

// Appends fields to the list; on failure the list is as it was.
template <class Split>
int32_t AppendFields(const char *sz, const char *szDelims, ORLICSzList **ppList, int iLine, Split split) {
    if (sz == nullptr || szDelims == nullptr || ppList == nullptr || *ppList == nullptr) {
        SetError(kErrBadParameters, kUnit, iLine);
        return -1;
    }
    int32_t before = (*ppList)->iCount;
    int32_t n = 0;
    bool bOk = split(std::string_view(sz), std::string_view(szDelims), [&](std::string_view field) {
        if (!xavo::core::ListPush(ppList, field)) return false;
        ++n;
        return true;
    });
    if (!bOk) {
        xavo::core::ListTruncate(*ppList, before);
        SetError(kErrOutOfMemory, kUnit, iLine);
        return -1;
    }
    return n;
}

}  // namespace

// Trims in place: the text is moved to the start of the buffer, so that
// callers can go on using their buffer.  Returns the buffer.
XAVO_PLATFORM_API char *ORLICStrTrim(char *sz, int32_t /*iReserved1*/, int32_t /*iReserved2*/) {
    Counted(__func__);
    if (sz == nullptr) return nullptr;
    const std::string_view kept = Trim(sz);
    std::memmove(sz, kept.data(), kept.size());
    sz[kept.size()] = '\0';
    return sz;
}

// Every delimiter character ends a field, so empty fields are kept: "a==b"
// split at "=" gives "a", "" and "b".  The number of fields appended.
XAVO_PLATFORM_API int32_t ORLICStrSep(const char *sz, const char *szDelims, ORLICSzList **ppList) {
    if (XAVO_INJECTED()) return -1;
    return AppendFields(sz, szDelims, ppList, __LINE__, [](std::string_view text, std::string_view delims, auto push) {
        for (;;) {
            size_t at = text.find_first_of(delims);
            if (!push(text.substr(0, at))) return false;
            if (at == std::string_view::npos) return true;
            text.remove_prefix(at + 1);
        }
    });
}

// Runs of delimiter characters separate fields and empty fields are
// dropped: "a==b" split at "=" gives "a" and "b".  The number of fields
// appended.
XAVO_PLATFORM_API int32_t ORLICStrTok(const char *sz, const char *szDelims, ORLICSzList **ppList) {
    if (XAVO_INJECTED()) return -1;
    return AppendFields(sz, szDelims, ppList, __LINE__, [](std::string_view text, std::string_view delims, auto push) {
        for (;;) {
            size_t start = text.find_first_not_of(delims);
            if (start == std::string_view::npos) return true;
            text.remove_prefix(start);
            size_t end = text.find_first_of(delims);
            if (!push(text.substr(0, end))) return false;
            if (end == std::string_view::npos) return true;
            text.remove_prefix(end);
        }
    });
}

// Lower-cased copy, cut to fit; the destination, or NULL for bad arguments.
// Source and destination may be the same buffer.
XAVO_PLATFORM_API char *ORLICStrCaseLower(const char *szSrc, int32_t /*iReserved*/, char *szDst, int32_t cbDst) {
    Counted(__func__);
    if (szSrc == nullptr || szDst == nullptr || cbDst <= 0) return nullptr;
    int32_t i = 0;
    for (; i < cbDst - 1 && szSrc[i] != '\0'; ++i) {
        szDst[i] = static_cast<char>(std::tolower(static_cast<unsigned char>(szSrc[i])));
    }
    szDst[i] = '\0';
    return szDst;
}

// Appends to a heap text that the caller releases with free().  The text's
// new length, or -1 with the text and its size unchanged.
XAVO_PLATFORM_API int32_t ORLICStrCat(char **ppsz, int32_t *pcbAlloc, const char *szPiece) {
    if (XAVO_INJECTED()) return -1;
    if (ppsz == nullptr || pcbAlloc == nullptr || szPiece == nullptr || (*ppsz != nullptr && *pcbAlloc <= 0)) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    size_t have = 0;
    if (*ppsz != nullptr) {
        have = strnlen(*ppsz, static_cast<size_t>(*pcbAlloc));
        // No end within the allocation: not a text we made.
        if (have == static_cast<size_t>(*pcbAlloc)) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return -1;
        }
    }
    size_t piece = std::strlen(szPiece);
    size_t cbAlloc = *ppsz != nullptr ? static_cast<size_t>(*pcbAlloc) : 0;
    if (piece > static_cast<size_t>(INT32_MAX) - 1 - have) {
        SetError(kErrOutOfMemory, kUnit, __LINE__);
        return -1;
    }
    size_t need = have + piece + 1;
    if (need > cbAlloc) {
        // Doubling keeps a text built line by line linear in its length.
        size_t grown = cbAlloc < static_cast<size_t>(kMinCatAlloc) ? kMinCatAlloc : cbAlloc;
        while (grown < need) grown = grown > static_cast<size_t>(INT32_MAX) / 2 ? need : grown * 2;
        if (grown > static_cast<size_t>(INT32_MAX)) grown = need;
        auto *p = static_cast<char *>(std::realloc(*ppsz, grown));
        if (p == nullptr) {
            SetError(kErrOutOfMemory, kUnit, __LINE__);
            return -1;
        }
        if (*ppsz == nullptr) p[0] = '\0';
        *ppsz = p;
        *pcbAlloc = static_cast<int32_t>(grown);
    }
    std::memcpy(*ppsz + have, szPiece, piece + 1);
    return static_cast<int32_t>(have + piece);
}

// Replaces the first occurrence of szOld.  The bytes written with the
// closing NUL (always more than 0) on success; 0 when szOld does not occur
// (the destination then holds the source unchanged, if it fits); -1 when the
// result does not fit (the destination is then empty) or for bad arguments.
XAVO_PLATFORM_API int32_t ORLICStrReplace(const char *szSrc, const char *szOld, const char *szNew, char *szDst,
                                          int32_t cbDst) {
    if (XAVO_INJECTED()) return -1;
    if (szSrc == nullptr || szOld == nullptr || szOld[0] == '\0' || szNew == nullptr || szDst == nullptr ||
        cbDst <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        std::string src(szSrc);  // a copy: the destination may overlap the source
        size_t at = src.find(szOld);
        std::string out = src;
        if (at != std::string::npos) out.replace(at, std::strlen(szOld), szNew);
        if (out.size() >= static_cast<size_t>(cbDst)) {
            szDst[0] = '\0';
            SetError(kErrBufTooSmall, kUnit, __LINE__);
            return int32_t{-1};
        }
        std::memcpy(szDst, out.c_str(), out.size() + 1);
        return at == std::string::npos ? int32_t{0} : static_cast<int32_t>(out.size() + 1);
    });
}
