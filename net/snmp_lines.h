// The lines snmpwalk prints for a printer's enterprises subtree, read one
// at a time.  A text value comes out as
//     SNMPv2-SMI::enterprises.99999.1.1.0 = STRING: "MFG:ACME;MDL:LX 100;"
// and after trimming its closing quote is the line's last character.
#pragma once

#include <string_view>

namespace xavo {

// ---- device ID strings ----
enum class SnmpIdKind {
    kNone,       // not a device ID line
    kValue,      // value holds the device ID string
    kCutShort,   // a device ID line with nothing after its value marker
};
struct SnmpDeviceId {
    SnmpIdKind kind = SnmpIdKind::kNone;
    std::string_view value;
};
// A line qualifies when it holds a manufacturer key ("MANUFACTURER:",
// "MFG:", "MFR:"), a model key ("MODEL:", "MDL:") and the value marker
// "STRING: \"", anywhere and case-sensitively; the value is what follows
// the first marker, less the line's last character (the closing quote).
SnmpDeviceId SnmpDeviceIdFromLine(std::string_view line);

// ---- printer URIs ----
enum class SnmpUriKind {
    kPass,  // not a printer URI line: read on
    kBad,   // a "://" line the reader cannot take: the lookup fails
    kUri,   // text holds the URI, closing quote removed
};
struct SnmpUri {
    SnmpUriKind kind = SnmpUriKind::kPass;
    std::string_view text;
};
// A "://" line whose quoted text begins, ignoring case, with "LPR", "lpd",
// "ipp", "socket" or "bjnp".
SnmpUri SnmpUriFromLine(std::string_view line);

// The CUPS backend a URI's scheme stands for.
enum class SnmpBackend {
    kLpd,        // "lpd" is written
    kScheme,     // the scheme itself, in lower case
    kUnmapped,   // no backend: the lookup fails
};
struct SnmpUriParts {
    SnmpBackend backend = SnmpBackend::kUnmapped;
    std::string_view scheme;  // before the first ":"
    std::string_view rest;    // after it, "//host/queue..."
};
SnmpUriParts SnmpSplitUri(std::string_view uri);

}  // namespace xavo
