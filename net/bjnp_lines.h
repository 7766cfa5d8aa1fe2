// The device listing of the CUPS BJNP backend, one device a line:
//     network bjnp://10.0.0.5:8611 "Canon MX920 series" "Canon MX920 series 10.0.0.5" "MFG:Canon;CMD:BJL,BJRaster3;MDL:MX920 series;CLS:PRINTER;"
// and a generic line for printers it could not place:
//     network bjnp "Unknown" "Canon network printer"
#pragma once

#include <string_view>

namespace xavo {

enum class BjnpLineKind {
    kOther,         // another device, or not a device line
    kUnknown,       // the generic "Unknown" entry
    kUnidentified,  // a device the backend could not identify yet
    kMatch,         // the device at the address asked for
};
struct BjnpLine {
    BjnpLineKind kind = BjnpLineKind::kOther;
    bool bHasManufacturer = false;  // kMatch: a manufacturer key was found
    std::string_view stringId;      // kMatch with a key: the device ID text
};

// "/<address>:8611", the part of a device URI that names one address.
std::string_view BjnpIpPattern(const char *szIP, char (&szBuf)[32]);

// Classifies one trimmed line.  The device ID starts at the first of
// "MANUFACTURER:", "MFG:", "MFR:" found (in that order of preference) and
// runs to the end of the line less its last two characters.
BjnpLine BjnpClassifyLine(std::string_view line, std::string_view ipPattern);

}  // namespace xavo
