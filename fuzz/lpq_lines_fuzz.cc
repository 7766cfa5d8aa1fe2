// The reader of lpq's listing: the input is a job ID (up to the first
// newline) and the tool's whole output, read whole line by whole line as
// the job wait reads it.  Every line read ends at its newline or at the end
// of the output; an output without NUL bytes (text, as lpq prints) comes
// back exactly, and a job shown on any of its lines is found.
#include <string>

#include "fuzz/fuzz_support.h"
#include "internal/line_reader.h"
#include "print/lpq_lines.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view in = xavo::fuzz::AsText(data, size);
    const size_t nl = in.find('\n');
    if (nl == std::string_view::npos) return 0;
    const std::string jobId(std::string(in.substr(0, nl)).c_str());
    const std::string_view output = in.substr(nl + 1);

    xavo::fuzz::ToolOutput stream(output);
    std::string line;
    std::string all;
    bool bListed = false;
    while (xavo::ReadLine(stream.get(), line) == xavo::ReadStatus::kLine) {
        FUZZ_CHECK(!line.empty());
        const size_t newline = line.find('\n');
        FUZZ_CHECK(newline == std::string::npos || newline == line.size() - 1);
        bListed = bListed || xavo::LpqLineListsJob(line, jobId);
        all += line;
    }
    if (output.find('\0') != std::string_view::npos) return 0;
    FUZZ_CHECK(all == output);
    bool bShown = false;
    for (std::string_view rest = output; !rest.empty();) {
        const size_t end = rest.find('\n');
        bShown = bShown || rest.substr(0, end).find(jobId) != std::string_view::npos;
        rest.remove_prefix(end == std::string_view::npos ? rest.size() : end + 1);
    }
    FUZZ_CHECK(bListed == bShown);
    return 0;
}
