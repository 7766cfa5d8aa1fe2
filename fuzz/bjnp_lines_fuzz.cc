// The reader of the BJNP backend's device listing: the input is an address
// (up to the first newline) and the backend's whole output, read through
// the library's tool-line reader with the BJNP lookup's line buffer, each
// line classified as the lookup does.
#include <string>

#include "fuzz/fuzz_support.h"
#include "net/bjnp_lines.h"

namespace {

using xavo::fuzz::Within;

constexpr int kLineBuffer = 1024;

void CheckLine(std::string_view line, std::string_view pattern) {
    xavo::BjnpLine found = xavo::BjnpClassifyLine(line, pattern);
    switch (found.kind) {
        case xavo::BjnpLineKind::kOther:
            FUZZ_CHECK(line.find(pattern) == std::string_view::npos);
            break;
        case xavo::BjnpLineKind::kUnknown:
            FUZZ_CHECK(line.find("\"Unknown\"") != std::string_view::npos);
            break;
        case xavo::BjnpLineKind::kUnidentified:
            FUZZ_CHECK(line.find("\"Unidentified printer\"") != std::string_view::npos);
            break;
        case xavo::BjnpLineKind::kMatch:
            FUZZ_CHECK(line.find(pattern) != std::string_view::npos);
            if (!found.bHasManufacturer) {
                FUZZ_CHECK(found.stringId.empty());
                break;
            }
            // From the manufacturer key to the end, less the closing ";\"".
            FUZZ_CHECK(Within(found.stringId, line));
            FUZZ_CHECK(found.stringId.data() + found.stringId.size() == line.data() + line.size() - 2);
            // It starts at a manufacturer key (which a line that ends right
            // after the key cuts short: the lookup then finds no vendor).
            const std::string_view from = line.substr(static_cast<size_t>(found.stringId.data() - line.data()));
            FUZZ_CHECK(from.starts_with("MANUFACTURER:") || from.starts_with("MFG:") || from.starts_with("MFR:"));
            break;
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view in = xavo::fuzz::AsText(data, size);
    size_t nl = in.find('\n');
    if (nl == std::string_view::npos) return 0;
    const std::string address(std::string(in.substr(0, nl)).c_str());
    char szPattern[32];
    const std::string_view pattern = xavo::BjnpIpPattern(address.c_str(), szPattern);
    FUZZ_CHECK(pattern.size() < sizeof szPattern && pattern.starts_with('/'));
    xavo::fuzz::ForEachToolLine(in.substr(nl + 1), kLineBuffer, [&](char *, std::string_view line) {
        CheckLine(line, pattern);
        return true;
    });
    return 0;
}
