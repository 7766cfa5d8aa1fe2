// Section files: "[name]" header lines followed by "key = value" lines, the
// form Samba reads for smb.conf.  The appliance keeps the printer
// configuration and the Samba printer share in this form.
//
// Reading follows Samba: blank lines and comments ("#", ";") are skipped,
// white space around "=" and around the value is dropped, a key set twice
// keeps its last value and two sections of one name read as one.  Writing
// changes only the section concerned; every other line of the file stays as
// it was, comments included, and the file is replaced atomically.
#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "common/replace_lock.h"
#include "common/text_files.h"
#include "core/containers.h"
#include "core/section_document.h"

using namespace xavo::platform;
using xavo::core::DocumentPtr;
using xavo::core::ForgetSectionDocument;
using xavo::core::LoadSectionDocument;

namespace {
constexpr char kUnit[] = "section_file";
// The layout of a single key set by ORLICFileSetSectionValue, the same as
// the printer library's whole-section writes.
constexpr char kSingleKeyFormat[] = "\t%s = %s\n";

// Names and keys are refused rather than altered: a changed name would be
// another printer, and a line break would forge lines of its own.
bool NameOk(const char *sz) { return sz != nullptr && sz[0] != '\0' && !HasControl(sz); }

// A key must read back as itself: no "=" (the reader splits at the first),
// no white space at its ends (the reader trims it), and no first character
// that turns the line into a comment or a header.
bool KeyOk(std::string_view key) {
    return !key.empty() && !HasControl(key) && key.find('=') == std::string_view::npos && Trim(key) == key &&
           key.front() != '[' && key.front() != '#' && key.front() != ';';
}

// Device ID strings from printers may carry line breaks and other control
// characters; in a value they become blanks, which is what a reader would
// make of them anyway, instead of breaking the file's lines.
std::string CleanValue(std::string_view value) {
    std::string clean(value);
    std::replace_if(clean.begin(), clean.end(), IsControl, ' ');
    return clean;
}

// "[name]" and one line per pair in the caller's line format.
bool SectionText(const char *szName, const ORLICSzHash *pHash, const char *szLineFormat, std::string *pText) {
    std::string text = "[" + std::string(szName) + "]\n";
    for (const auto &[key, value] : xavo::core::HashPairs(pHash)) {
        std::string line;
        if (!KeyOk(key) || !FormatLine(szLineFormat, key, CleanValue(value), &line)) return false;
        text += line;
    }
    *pText = std::move(text);
    return true;
}

// The file of the operations that work inside an existing section: nothing,
// with the last error set, when it cannot be read or has no section of the
// name.
DocumentPtr LoadWithSection(const char *szPath, const char *szSection, int iLine) {
    DocumentPtr doc = LoadSectionDocument(szPath, false, kUnit, iLine);
    if (!doc) return nullptr;
    if (doc->Named(szSection).empty()) {
        SetError(kErrNotFound, kUnit, iLine);
        return nullptr;
    }
    return doc;
}

// Every write of a section file goes through here: the parse kept of the
// file's old version is dropped with it.
bool Store(const char *szPath, std::string_view text) {
    ForgetSectionDocument(szPath);
    return StoreTextFile(szPath, text, kUnit);
}

}  // namespace

XAVO_PLATFORM_API int32_t ORLICFileGetSection(const char *szPath, const char *szSection, ORLICSzHash **ppHash) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szSection == nullptr || ppHash == nullptr || *ppHash == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        auto doc = LoadWithSection(szPath, szSection, __LINE__);
        if (!doc) return int32_t{-1};
        // Collected first, so that a section that cannot be read leaves the
        // caller's hash as it was.
        auto keys = doc->KeyLines(doc->Named(szSection));
        for (const auto &[i, kv] : keys) xavo::core::HashSet(ppHash, kv.key, kv.value);
        return static_cast<int32_t>(keys.size());
    });
}

XAVO_PLATFORM_API int32_t ORLICFileAddSection(const char *szPath, const char *szSection, const ORLICSzHash *pHash,
                                              const char *szLineFormat) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || !NameOk(szSection) || pHash == nullptr || szLineFormat == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD_WRITE(szPath, int32_t{-1}, [&] {
        DocumentPtr doc = LoadSectionDocument(szPath, true, kUnit, __LINE__);
        if (!doc) return int32_t{-1};
        if (!doc->Named(szSection).empty()) return int32_t{0};
        std::string section;
        if (!SectionText(szSection, pHash, szLineFormat, &section)) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        return Store(szPath, doc->Appended(section)) ? int32_t{1} : int32_t{-1};
    });
}

XAVO_PLATFORM_API int32_t ORLICFileSetSection(const char *szPath, const char *szOldSection,
                                              const char *szNewSection, const ORLICSzHash *pHash,
                                              const char *szLineFormat) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szOldSection == nullptr || !NameOk(szNewSection) || pHash == nullptr ||
        szLineFormat == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD_WRITE(szPath, int32_t{-1}, [&] {
        DocumentPtr doc = LoadSectionDocument(szPath, true, kUnit, __LINE__);
        if (!doc) return int32_t{-1};
        // Renaming onto another existing section would merge two printers'
        // records; refuse it.
        if (std::strcmp(szOldSection, szNewSection) != 0 && !doc->Named(szNewSection).empty()) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        std::string section;
        if (!SectionText(szNewSection, pHash, szLineFormat, &section)) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        // The new section takes the place of the first one of the old name;
        // further ones of that name (which readers merge into it) go, so
        // that the file holds exactly the caller's pairs.  Comments and
        // blank lines after a section's last key stay with the file.
        auto found = doc->Named(szOldSection);
        std::string text = found.empty() ? doc->Appended(section) : doc->Replaced(found, section);
        return Store(szPath, text) ? int32_t{1} : int32_t{-1};
    });
}

XAVO_PLATFORM_API int32_t ORLICFileGetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                                   char *szBuf, int32_t cbBuf) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szSection == nullptr || szKey == nullptr || szBuf == nullptr || cbBuf <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        auto doc = LoadWithSection(szPath, szSection, __LINE__);
        if (!doc) return int32_t{-1};
        std::optional<std::string_view> value;
        for (const auto &[i, kv] : doc->KeyLines(doc->Named(szSection))) {
            if (kv.key == szKey) value = kv.value;
        }
        if (!value) {
            SetError(kErrKeyNotFound, kUnit, __LINE__);
            return int32_t{-1};
        }
        return CopyValue(*value, szBuf, cbBuf);
    });
}

XAVO_PLATFORM_API int32_t ORLICFileSetSectionValue(const char *szPath, const char *szSection, const char *szKey,
                                                   const char *szValue) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szSection == nullptr || szKey == nullptr || !KeyOk(szKey) || szValue == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD_WRITE(szPath, int32_t{-1}, [&] {
        // Only an existing section gets the key: a section made up here
        // would be a record of a printer nobody set up.
        auto doc = LoadWithSection(szPath, szSection, __LINE__);
        if (!doc) return int32_t{-1};
        auto found = doc->Named(szSection);
        std::string line;
        FormatLine(kSingleKeyFormat, szKey, CleanValue(szValue), &line);
        // The line in force is the key's last one (readers keep the last
        // value); without one the key goes after the last section's keys.
        std::optional<size_t> at;
        for (const auto &[i, kv] : doc->KeyLines(found)) {
            if (kv.key == szKey) at = i;
        }
        std::string text = at ? doc->WithLine(*at, true, line) : doc->WithLine(found.back().bodyEnd, false, line);
        return Store(szPath, text) ? int32_t{0} : int32_t{-1};
    });
}
