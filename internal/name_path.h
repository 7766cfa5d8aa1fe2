// Paths the library builds from a name it was given or read: a printer ID
// or a file's base name placed into a fixed directory ("/etc/cups/ppd/%s.ppd",
// "/tmp/usbip_%s").  A USB printer's ID carries the serial number the device
// reports, so the printer controls that text: it must never lead out of the
// directory, and never be cut into a shorter path that names another file
// (cutting ".ppd" off a long name reads a file of the caller's choosing).
#pragma once

#include <cstdio>
#include <cstring>

namespace xavo {

// Characters that the platform's process runners and shells take as a file
// name pattern.  A name that holds one never goes into a path handed to a
// program: where such a path is expanded, it names other printers' files.
inline constexpr char kFilePatternChars[] = "*?[";

// Fills szPath[cbPath] from szFormat (one "%s") and szName.  False, with
// szPath emptied, when the name holds "/" or the whole path does not fit:
// the buffers are those the appliance has always used, and a name too long
// for them is refused rather than cut.
inline bool NamePath(char *szPath, size_t cbPath, const char *szFormat, const char *szName) {
    szPath[0] = '\0';
    if (std::strchr(szName, '/') != nullptr) return false;
    const int iLen = std::snprintf(szPath, cbPath, szFormat, szName);
    if (iLen >= 0 && static_cast<size_t>(iLen) < cbPath) return true;
    szPath[0] = '\0';
    return false;
}

template <size_t N>
inline bool NamePath(char (&szPath)[N], const char *szFormat, const char *szName) {
    return NamePath(szPath, N, szFormat, szName);
}

// Whether a name holds a file name pattern character.
inline bool HoldsFilePattern(const char *szName) { return std::strpbrk(szName, kFilePatternChars) != nullptr; }

}  // namespace xavo
