// The reader of ping's output: the input is the tool's whole output, read
// through the library's tool-line reader with the reachability check's line
// buffer, each line given to the summary parser as the check does.
#include "fuzz/fuzz_support.h"
#include "net/ping_lines.h"

namespace {
constexpr int kLineBuffer = 1024;
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    xavo::fuzz::ForEachToolLine(xavo::fuzz::AsText(data, size), kLineBuffer, [](char *, std::string_view line) {
        std::optional<bool> reachable = xavo::PingSummaryReachable(line);
        FUZZ_CHECK(reachable.has_value() == (line.find("packet loss") != std::string_view::npos));
        // A summary whose loss field says 100% is never read as reachable.
        const size_t first = line.find(',');
        const size_t second = first == std::string_view::npos ? first : line.find(',', first + 1);
        if (second != std::string_view::npos && line.substr(second).starts_with(", 100% packet loss")) {
            FUZZ_CHECK(reachable == false);
        }
        return true;
    });
    return 0;
}
