// Paths the library builds from a name it was given or read: a printer ID
// or a file's base name placed into a fixed directory ("/etc/cups/ppd/" +
// name + ".ppd", "/tmp/usbip_" + name).  A USB printer's ID carries the
// serial number the device reports, so the printer controls that text: it
// must never lead out of the directory, and never be cut into a shorter
// path that names another file (cutting ".ppd" off a long name reads a
// file of the caller's choosing).
#pragma once

#include <cstring>
#include <string_view>

namespace xavo {

// The fixed parts around the name.
struct NamedFile {
    std::string_view prefix;  // the directory, and the start of the file name
    std::string_view suffix;
};

// Characters that the platform's process runners and shells take as a file
// name pattern.  A name that holds one never goes into a path handed to a
// program: where such a path is expanded, it names other printers' files.
inline constexpr char kFilePatternChars[] = "*?[";

// Whether a name stays in the directory it is placed in: it holds no "/".
inline bool IsBaseName(const char *szName) { return std::strchr(szName, '/') == nullptr; }

// Fills szPath[cbPath] with the prefix, the name and the suffix.  False,
// with szPath emptied, when the name holds "/" or the whole path does not
// fit: the buffers are those the appliance has always used, and a name too
// long for them is refused rather than cut.
inline bool NamePath(char *szPath, size_t cbPath, const NamedFile &file, const char *szName) {
    szPath[0] = '\0';
    if (!IsBaseName(szName)) return false;
    const std::string_view name(szName);
    const size_t cbNeeded = file.prefix.size() + name.size() + file.suffix.size() + 1;
    if (cbNeeded > cbPath) return false;
    char *p = szPath;
    for (std::string_view part : {file.prefix, name, file.suffix}) {
        std::memcpy(p, part.data(), part.size());
        p += part.size();
    }
    *p = '\0';
    return true;
}

template <size_t N>
inline bool NamePath(char (&szPath)[N], const NamedFile &file, const char *szName) {
    return NamePath(szPath, N, file, szName);
}

// Whether a name holds a file name pattern character.
inline bool HoldsFilePattern(const char *szName) { return std::strpbrk(szName, kFilePatternChars) != nullptr; }

}  // namespace xavo
