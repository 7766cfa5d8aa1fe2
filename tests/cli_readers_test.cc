// The xavoprinter command's pure helpers: its readers of one line of
// CUPS's listings, and the escaping of printer-supplied text for a
// terminal.
#include <gtest/gtest.h>

#include <string>

#include "cups_query.h"
#include "report.h"

namespace {

TEST(CliReaders, JobLinesOfLpqGiveNumberAndTitleAndHeadersGiveNothing) {
    const struct {
        const char *line;
        int job;  // 0: not a job line
        const char *title;
    } cases[] = {
        {"1st     root    1       xavo-311df6d8 letter            1024 bytes", 1, "xavo-311df6d8 letter"},
        {"3rd     root    3       xavo-b8274430 a very long title 1024 bytes", 3, "xavo-b8274430 a very long title"},
        {"active  root    12      testprint                       5120 bytes", 12, "testprint"},
        {"11th    lp      1234567 report                          1 bytes", 1234567, "report"},
        {"usbprinter1 is ready", 0, ""},
        {"usbprinter1 is not ready", 0, ""},
        {"Rank    Owner   Job     File(s)                         Total Size", 0, ""},
        {"no entries", 0, ""},
        {"1st     root    12a     x                               1 bytes", 0, ""},
    };
    for (const auto &c : cases) {
        const auto job = cli::ParseLpqJobLine(c.line);
        EXPECT_EQ(job.has_value(), c.job != 0) << c.line;
        if (job) {
            EXPECT_EQ(job->job, c.job) << c.line;
            EXPECT_EQ(job->title, c.title) << c.line;
        }
    }
}

TEST(CliReaders, PrinterLinesOfLpstatGiveQueueAndState) {
    const struct {
        const char *line;
        const char *name;  // nullptr: no printer line
        bool bEnabled;
    } cases[] = {
        {"printer office is idle.  enabled since Mon 23 Nov 2026 09:00:00 UTC", "office", true},
        {"printer office now printing office-3.  enabled since Mon 23 Nov 2026", "office", true},
        {"printer usbprinter1 disabled since Mon 23 Nov 2026 09:00:00 UTC -", "usbprinter1", false},
        {"scheduler is running", nullptr, false},
        {"\tPaused", nullptr, false},
        {"printer  is idle.", nullptr, false},
    };
    for (const auto &c : cases) {
        const auto q = cli::ParseLpstatPrinterLine(c.line);
        EXPECT_EQ(q.has_value(), c.name != nullptr) << c.line;
        if (q) {
            EXPECT_EQ(q->name, c.name) << c.line;
            EXPECT_EQ(q->bEnabled, c.bEnabled) << c.line;
        }
    }
}

TEST(CliReaders, SafeTextShowsControlsAndBytesThatAreNotUtf8AsHex) {
    const struct {
        std::string in, out;
    } cases[] = {
        {"Model 100", "Model 100"},
        {"caf\xc3\xa9 \xe2\x82\xac", "caf\xc3\xa9 \xe2\x82\xac"},
        {"\x1b[2J", "\\x1B[2J"},
        {"\xc2\x9b" "31m", "\\xC2\\x9B31m"},  // C1 control in UTF-8
        {"a\x7f\tb\n", "a\\x7F\\x09b\\x0A"},
        {"\xff\xfe", "\\xFF\\xFE"},
        {"\xc0\xaf", "\\xC0\\xAF"},                 // overlong "/"
        {"\xed\xa0\x80", "\\xED\\xA0\\x80"},     // surrogate
        {"\xe2\x82", "\\xE2\\x82"},                 // cut sequence
        {"back\\slash", "back\\\\slash"},
    };
    for (const auto &c : cases) EXPECT_EQ(cli::SafeText(c.in), c.out) << c.in;
}

}  // namespace
