// The reader of CUPS's queue list ("lpstat -v"): the input is an address
// (up to the first newline) and the tool's whole output, read with the
// queue list's line buffer; each line goes through the queue-name cut and
// the address pattern the lookups match with.
#include <cstring>
#include <string>

#include "cups/queue_list.h"
#include "fuzz/fuzz_support.h"

namespace {

using xavo::fuzz::Within;

// The queue list's line buffer.
constexpr int kLineSize = 1024;

std::string_view NextLine(std::string_view *pText) {
    size_t nl = pText->find('\n');
    std::string_view line = pText->substr(0, nl);
    pText->remove_prefix(nl == std::string_view::npos ? pText->size() : nl + 1);
    return line;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view in = xavo::fuzz::AsText(data, size);
    const std::string address(std::string(NextLine(&in)).c_str());

    // "/ADDR/" in 32 bytes: cut, never overrun, always terminated.
    const xavo::AddressPattern pattern(address.c_str());
    const size_t patternLen = strnlen(pattern.sz, sizeof pattern.sz);
    FUZZ_CHECK(patternLen < sizeof pattern.sz);
    FUZZ_CHECK(std::string_view(pattern.sz, patternLen) == ("/" + address + "/").substr(0, sizeof pattern.sz - 1));

    xavo::fuzz::ForEachToolLine(in, kLineSize, [&](char *szLine, std::string_view line) {
        std::string_view name = xavo::QueueNameOfLine(szLine);
        FUZZ_CHECK(Within(name, line));
        FUZZ_CHECK(name.find(':') == std::string_view::npos);
        if (!name.empty()) {
            // The name starts after the line's second blank.
            const size_t at = static_cast<size_t>(name.data() - line.data());
            const size_t second = line.find(' ', line.find(' ') + 1);
            FUZZ_CHECK(at == second + 1);
        }
        // The address checks' match over the same line.
        const bool bAddressed = std::strstr(szLine, pattern.sz) != nullptr;
        FUZZ_CHECK(bAddressed == (line.find(std::string_view(pattern.sz, patternLen)) != std::string_view::npos));
        return true;
    });
    return 0;
}
