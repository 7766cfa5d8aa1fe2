// Section files: "[name]" header lines followed by "key = value" lines, the
// form Samba reads for smb.conf.  The appliance keeps the printer
// configuration and the Samba printer share in this form.
//
// Reading follows Samba: blank lines and comments ("#", ";") are skipped,
// white space around "=" and around the value is dropped, a key set twice
// keeps its last value and two sections of one name read as one.  Writing
// changes only the section concerned; every other line of the file stays as
// it was, comments included, and the file is replaced atomically, under
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
constexpr char kUnit[] = "section_file";
// The layout of a single key set by ORLICFileSetSectionValue, the same as
// the printer library's whole-section writes.
constexpr char kSingleKeyFormat[] = "\t%s = %s\n";

struct Section {
    std::string name;
    size_t header = 0;   // line of "[name]"
    size_t bodyEnd = 0;  // one past the last key line (or the header)
};

struct Document {
    std::vector<std::string> lines;  // each with its newline
    std::vector<Section> sections;

    explicit Document(std::string_view text) : lines(SplitLines(text)) {
        for (size_t i = 0; i < lines.size(); ++i) {
            if (auto name = ParseSectionHeader(lines[i])) {
                sections.push_back({std::string(*name), i, i + 1});
            } else if (!sections.empty() && ParseSectionKeyLine(lines[i])) {
                sections.back().bodyEnd = i + 1;
            }
        }
    }

    std::vector<const Section *> Named(std::string_view name) const {
        std::vector<const Section *> found;
        for (const Section &s : sections) {
            if (s.name == name) found.push_back(&s);
        }
        return found;
    }

    // The key lines of the given sections, in file order, with their line
    // numbers.
    std::vector<std::pair<size_t, KeyValue>> KeyLines(const std::vector<const Section *> &found) const {
        std::vector<std::pair<size_t, KeyValue>> keys;
        for (const Section *s : found) {
            for (size_t i = s->header + 1; i < s->bodyEnd; ++i) {
                if (auto kv = ParseSectionKeyLine(lines[i])) keys.emplace_back(i, *kv);
            }
        }
        return keys;
    }
};

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
std::optional<Document> LoadWithSection(const char *szPath, const char *szSection, int iLine) {
    std::string text;
    if (!LoadTextFile(szPath, false, &text, kUnit, iLine)) return std::nullopt;
    Document doc(text);
    if (doc.Named(szSection).empty()) {
        SetError(kErrNotFound, kUnit, iLine);
        return std::nullopt;
    }
    return doc;
}

void EndWithNewline(std::string *pLine) {
    if (!pLine->empty() && pLine->back() != '\n') pLine->push_back('\n');
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
        std::string text;
        if (!LoadTextFile(szPath, true, &text, kUnit, __LINE__)) return int32_t{-1};
        if (!Document(text).Named(szSection).empty()) return int32_t{0};
        std::string section;
        if (!SectionText(szSection, pHash, szLineFormat, &section)) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        EndWithNewline(&text);
        text += section;
        return StoreTextFile(szPath, text, kUnit) ? int32_t{1} : int32_t{-1};
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
        std::string text;
        if (!LoadTextFile(szPath, true, &text, kUnit, __LINE__)) return int32_t{-1};
        Document doc(text);
        // Renaming onto another existing section would merge two printers'
        // records; refuse it.
        if (std::strcmp(szOldSection, szNewSection) != 0 && !doc.Named(szNewSection).empty()) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        std::string section;
        if (!SectionText(szNewSection, pHash, szLineFormat, &section)) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        auto found = doc.Named(szOldSection);
        if (found.empty()) {
            EndWithNewline(&text);
            text += section;
            return StoreTextFile(szPath, text, kUnit) ? int32_t{1} : int32_t{-1};
        }
        // The new section takes the place of the first one of the old name;
        // further ones of that name (which readers merge into it) go, so
        // that the file holds exactly the caller's pairs.  Comments and
        // blank lines after a section's last key stay with the file.
        for (auto it = found.rbegin(); it != found.rend(); ++it) {
            const Section *s = *it;
            auto first = doc.lines.begin() + static_cast<std::ptrdiff_t>(s->header);
            auto last = doc.lines.begin() + static_cast<std::ptrdiff_t>(s->bodyEnd);
            if (s == found.front()) {
                *first = section;
                doc.lines.erase(first + 1, last);
            } else {
                doc.lines.erase(first, last);
            }
        }
        return StoreTextFile(szPath, JoinLines(doc.lines), kUnit) ? int32_t{1} : int32_t{-1};
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
        if (at) {
            doc->lines[*at] = line;
        } else {
            size_t after = found.back()->bodyEnd;
            EndWithNewline(&doc->lines[after - 1]);
            doc->lines.insert(doc->lines.begin() + static_cast<std::ptrdiff_t>(after), line);
        }
        return StoreTextFile(szPath, JoinLines(doc->lines), kUnit) ? int32_t{0} : int32_t{-1};
    });
}
