// The xavoprinter command's pure helpers: its readers of one line of
// CUPS's listings, and the escaping of printer-supplied text for a
// terminal.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "cups_query.h"
#include "report.h"

namespace {

// A text given to a reader and what the reader makes of it, as a string.
struct Case {
    std::string in, want;
};

void ExpectEach(const std::vector<Case> &cases, const std::function<std::string(const std::string &)> &read) {
    for (const Case &c : cases) EXPECT_EQ(read(c.in), c.want) << c.in;
}

TEST(CliReaders, JobLinesOfLpqGiveNumberAndTitleAndHeadersGiveNothing) {
    ExpectEach(
        {
            {"1st     root    1       xavo-311df6d8 letter            1024 bytes", "1 xavo-311df6d8 letter"},
            {"3rd     root    3       xavo-b8274430 a very long title 1024 bytes", "3 xavo-b8274430 a very long title"},
            {"active  root    12      testprint                       5120 bytes", "12 testprint"},
            {"11th    lp      1234567 report                          1 bytes", "1234567 report"},
            {"usbprinter1 is ready", "none"},
            {"no entries", "none"},
            {"1st     root    12a     x                               1 bytes", "none"},
        },
        [](const std::string &line) {
            const auto job = cli::ParseLpqJobLine(line);
            return job ? std::to_string(job->job) + " " + job->title : "none";
        });
}

TEST(CliReaders, PrinterLinesOfLpstatGiveQueueAndState) {
    ExpectEach(
        {
            {"printer office is idle.  enabled since Mon 23 Nov 2026 09:00:00 UTC", "office enabled"},
            {"printer office now printing office-3.  enabled since Mon 23 Nov 2026", "office enabled"},
            {"printer usbprinter1 disabled since Mon 23 Nov 2026 09:00:00 UTC -", "usbprinter1 disabled"},
            {"scheduler is running", "none"},
            {"printer  is idle.", "none"},
        },
        [](const std::string &line) {
            const auto q = cli::ParseLpstatPrinterLine(line);
            return q ? q->name + (q->bEnabled ? " enabled" : " disabled") : "none";
        });
}

TEST(CliReaders, SafeTextShowsControlsAndBytesThatAreNotUtf8AsHex) {
    ExpectEach(
        {
            {"Model 100", "Model 100"},
            {"caf\xc3\xa9 \xe2\x82\xac", "caf\xc3\xa9 \xe2\x82\xac"},
            {"a\x7f\tb\n", "a\\x7F\\x09b\\x0A"},
            {"\xc0\xaf", "\\xC0\\xAF"},           // overlong "/"
            {"\xed\xa0\x80", "\\xED\\xA0\\x80"},  // surrogate
            {"\xe2\x82", "\\xE2\\x82"},           // cut sequence
            {"back\\slash", "back\\\\slash"},
        },
        [](const std::string &text) { return cli::SafeText(text); });
}

}  // namespace
