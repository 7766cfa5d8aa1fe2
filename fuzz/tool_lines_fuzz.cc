// The tool-line reader itself (ReadToolLines over the platform's trim),
// with line buffers from 2 bytes to 257: whatever the output and the
// buffer, every line a caller sees is a trimmed piece of one line of the
// output that fits the buffer, and the reading ends.
#include "fuzz/fuzz_support.h"

namespace {
bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\v' || c == '\f'; }
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view in = xavo::fuzz::AsText(data, size);
    if (in.empty()) return 0;
    const int cbBuf = 2 + static_cast<uint8_t>(in[0]);
    in.remove_prefix(1);
    size_t nLines = 0;
    xavo::ToolRead end = xavo::fuzz::ForEachToolLine(in, cbBuf, [&](char *, std::string_view line) {
        ++nLines;
        FUZZ_CHECK(in.find(line) != std::string_view::npos);
        if (!line.empty()) FUZZ_CHECK(!IsBlank(line.front()) && !IsBlank(line.back()));
        return true;
    });
    // Each piece takes at least one byte of the output.
    FUZZ_CHECK(end == xavo::ToolRead::kEnd);
    FUZZ_CHECK(nLines <= in.size());
    return 0;
}
