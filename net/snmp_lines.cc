#include "net/snmp_lines.h"

#include <strings.h>

#include <array>

namespace xavo {

namespace {

constexpr std::array<std::string_view, 3> kSnmpManufacturerKeys = {"MANUFACTURER:", "MFG:", "MFR:"};
constexpr std::array<std::string_view, 2> kModelKeys = {"MODEL:", "MDL:"};
constexpr std::string_view kValueMarker = "STRING: \"";
constexpr std::string_view kUriMark = "://";

// Prefixes a printer URI is recognised by, each compared ignoring case
// over its own length.
constexpr std::array<std::string_view, 5> kUriPrefixes = {"LPR", "lpd", "ipp", "socket", "bjnp"};

template <size_t N>
bool HoldsAny(std::string_view line, const std::array<std::string_view, N> &keys) {
    for (std::string_view key : keys) {
        if (line.find(key) != std::string_view::npos) return true;
    }
    return false;
}

bool StartsNoCase(std::string_view text, std::string_view prefix) {
    return text.size() >= prefix.size() && strncasecmp(text.data(), prefix.data(), prefix.size()) == 0;
}

bool EqualsNoCase(std::string_view a, std::string_view b) {
    return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

}  // namespace

SnmpDeviceId SnmpDeviceIdFromLine(std::string_view line) {
    if (line.empty() || !HoldsAny(line, kSnmpManufacturerKeys) || !HoldsAny(line, kModelKeys)) return {};
    size_t marker = line.find(kValueMarker);
    if (marker == std::string_view::npos) return {};
    std::string_view after = line.substr(marker + kValueMarker.size());
    // A line that ends right at its opening quote has no value, not even
    // an empty one: it was cut short, and the caller treats it as bad data
    // rather than reporting an empty device ID as found.
    if (after.empty()) return {SnmpIdKind::kCutShort, {}};
    return {SnmpIdKind::kValue, after.substr(0, after.size() - 1)};
}

SnmpUri SnmpUriFromLine(std::string_view line) {
    if (line.find(kUriMark) == std::string_view::npos) return {};
    size_t quote = line.find('"');
    if (quote == std::string_view::npos) return {SnmpUriKind::kBad, {}};
    std::string_view after = line.substr(quote + 1);
    if (after.size() < 2) return {SnmpUriKind::kBad, {}};
    for (std::string_view prefix : kUriPrefixes) {
        if (StartsNoCase(after, prefix)) return {SnmpUriKind::kUri, after.substr(0, after.size() - 1)};
    }
    return {};
}

SnmpUriParts SnmpSplitUri(std::string_view uri) {
    size_t colon = uri.find(':');
    // A bare scheme with no ":" names no printer: nothing to connect to and
    // no queue to read, so it is not taken as a backend.
    if (colon == std::string_view::npos) return {SnmpBackend::kUnmapped, uri, {}};
    SnmpUriParts parts{SnmpBackend::kUnmapped, uri.substr(0, colon), uri.substr(colon + 1)};
    // Printers publish LPD queues as "lpr://"; a few write the protocol's
    // own name, "lpd://".  Both reach the same CUPS backend, and refusing
    // the second would only leave such a printer unidentified, so both map
    // to "lpd".
    if (EqualsNoCase(parts.scheme, "LPR") || EqualsNoCase(parts.scheme, "lpd")) {
        parts.backend = SnmpBackend::kLpd;
    } else if (EqualsNoCase(parts.scheme, "ipp") || EqualsNoCase(parts.scheme, "socket") ||
               EqualsNoCase(parts.scheme, "bjnp")) {
        parts.backend = SnmpBackend::kScheme;
    }
    return parts;
}

}  // namespace xavo
