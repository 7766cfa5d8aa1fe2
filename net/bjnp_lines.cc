#include "net/bjnp_lines.h"

#include <array>
#include <cstdio>
#include <cstring>

namespace xavo {

namespace {
constexpr std::string_view kUnknownMark = "\"Unknown\"";
constexpr std::string_view kUnidentifiedMark = "\"Unidentified printer\"";
constexpr std::array<std::string_view, 3> kBjnpManufacturerKeys = {"MANUFACTURER:", "MFG:", "MFR:"};
// The device ID is quoted and, as the backend writes it, ends in ";\"":
// both go, leaving the last pair without its terminator.
constexpr size_t kTailDropped = 2;
}  // namespace

std::string_view BjnpIpPattern(const char *szIP, char (&szBuf)[32]) {
    std::memset(szBuf, 0, sizeof szBuf);
    std::snprintf(szBuf, sizeof szBuf, "/%s:8611", szIP);
    return std::string_view(szBuf);
}

BjnpLine BjnpClassifyLine(std::string_view line, std::string_view ipPattern) {
    if (line.find(kUnknownMark) != std::string_view::npos) return {BjnpLineKind::kUnknown, false, {}};
    if (line.find(kUnidentifiedMark) != std::string_view::npos) return {BjnpLineKind::kUnidentified, false, {}};
    if (line.find(ipPattern) == std::string_view::npos) return {};
    for (std::string_view key : kBjnpManufacturerKeys) {
        size_t at = line.find(key);
        if (at == std::string_view::npos) continue;
        // The key itself is longer than the two characters dropped, so the
        // text is never negative.
        return {BjnpLineKind::kMatch, true, line.substr(at, line.size() - at - kTailDropped)};
    }
    return {BjnpLineKind::kMatch, false, {}};
}

}  // namespace xavo
