// The readers of snmpwalk's output (the device ID lookup and the printer
// URI lookup): the input is the tool's whole output, read line by line
// through the library's tool-line reader with the walk's own line buffer,
// each line handed to the line parsers as both lookups do.
#include <strings.h>

#include "fuzz/fuzz_support.h"
#include "net/snmp_lines.h"
#include "net/snmp_walk.h"

namespace {

using xavo::fuzz::Within;

bool StartsNoCase(std::string_view text, std::string_view prefix) {
    return text.size() >= prefix.size() && strncasecmp(text.data(), prefix.data(), prefix.size()) == 0;
}

void CheckDeviceId(std::string_view line) {
    xavo::SnmpDeviceId id = xavo::SnmpDeviceIdFromLine(line);
    constexpr std::string_view kMarker = "STRING: \"";
    switch (id.kind) {
        case xavo::SnmpIdKind::kNone:
            break;
        case xavo::SnmpIdKind::kCutShort:
            FUZZ_CHECK(line.ends_with(kMarker));
            break;
        case xavo::SnmpIdKind::kValue:
            // What follows the first marker, less the line's last character.
            FUZZ_CHECK(Within(id.value, line));
            FUZZ_CHECK(id.value.data() == line.data() + line.find(kMarker) + kMarker.size());
            FUZZ_CHECK(id.value.data() + id.value.size() == line.data() + line.size() - 1);
            break;
    }
}

void CheckUri(std::string_view line) {
    xavo::SnmpUri uri = xavo::SnmpUriFromLine(line);
    if (uri.kind != xavo::SnmpUriKind::kUri) return;
    FUZZ_CHECK(line.find("://") != std::string_view::npos);
    FUZZ_CHECK(Within(uri.text, line) && !uri.text.empty());
    // The prefix is tested before the closing quote is dropped: on the
    // quoted text with that last character.
    const std::string_view quoted(uri.text.data(), uri.text.size() + 1);
    FUZZ_CHECK(Within(quoted, line));
    bool bKnown = false;
    for (std::string_view prefix : {"LPR", "lpd", "ipp", "socket", "bjnp"}) bKnown = bKnown || StartsNoCase(quoted, prefix);
    FUZZ_CHECK(bKnown);

    xavo::SnmpUriParts parts = xavo::SnmpSplitUri(uri.text);
    FUZZ_CHECK(Within(parts.scheme, uri.text) && Within(parts.rest, uri.text));
    if (uri.text.find(':') == std::string_view::npos) {
        FUZZ_CHECK(parts.backend == xavo::SnmpBackend::kUnmapped);
        return;
    }
    FUZZ_CHECK(parts.scheme.size() + 1 + parts.rest.size() == uri.text.size());
    FUZZ_CHECK(parts.scheme.find(':') == std::string_view::npos);
    const bool bLpd = strcasecmp(std::string(parts.scheme).c_str(), "lpr") == 0 ||
                      strcasecmp(std::string(parts.scheme).c_str(), "lpd") == 0;
    FUZZ_CHECK(bLpd == (parts.backend == xavo::SnmpBackend::kLpd));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    xavo::fuzz::ForEachToolLine(xavo::fuzz::AsText(data, size), xavo::kSnmpLineBuffer,
                                [](char *, std::string_view line) {
                                    CheckDeviceId(line);
                                    CheckUri(line);
                                    return true;
                                });
    return 0;
}
