// Printing and jobs: lpr's argument vector, reading lpq listings, cleaning
// the spool (a held job against a real scheduler is followed by the
// command's suite, and the demo walk-through delivers a test page and a
// file end to end).
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>

#include <functional>
#include <string>
#include <vector>

#include "appliance/standin_control.h"
#include "sandbox/cupsd.h"
#include "support/cases.h"
#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/paths.h"
#include "support/processes.h"
#include "xavoprinter.h"

using ::testing::AllOf;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";
constexpr char kQueue[] = "usbprinter1";
constexpr char kSpool[] = "/var/services/printer";

// Adds the printer's section; the real-scheduler tests share one sandbox,
// where a section from an earlier test is left as it is.
void SetCupsName(const std::string &printerId, const std::string &queue) {
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    ORLICSzHashSetValue(&hash, "cups printer name", queue.c_str());
    ORLICFileAddSection(kConf, printerId.c_str(), hash, "\t%s = %s\n");
    ORLICSzHashFree(hash);
}

// lpr is a recorder here; jobs through the real scheduler are followed in
// the command's suite and the demo walk-through.
TEST(PrintSubmission, LprGetsExactlyTheOptionsAsked) {
    struct { const char *szName, *szTitle; int32_t blRemove; std::vector<std::string> args; } const cases[] = {
        {"remove only", nullptr, 1, {"-P", kQueue, "-r", "/tmp/doc.pdf"}},
        {"every option: the vector full", "Payroll", 1, {"-P", kQueue, "-r", "-T", "Payroll", "/tmp/doc.pdf"}},
        {"title only", "t;$(id)", 0, {"-P", kQueue, "-T", "t;$(id)", "/tmp/doc.pdf"}},
        {"remove flag 2 keeps the file", "", 2, {"-P", kQueue, "/tmp/doc.pdf"}},
    };
    SetCupsName(kPrinter, kQueue);
    PlaceRecorder("/usr/bin/lpr", "lpr");
    for (const auto &c : cases) {
        EXPECT_EQ(XAVOPrinterCupsPrintFile(kPrinter, "/tmp/doc.pdf", c.szTitle, c.blRemove), 0) << c.szName;
        EXPECT_EQ(RecordedArgs("lpr"), c.args) << c.szName;
    }
    EXPECT_THAT(Logs(), IsEmpty());
    // A failed lpr: the runner's result in the line is lpr's exit status.
    PlaceFile("/tmp/lpr.exit", "4\n");
    EXPECT_EQ(XAVOPrinterCupsPrintTestPage(kPrinter), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_print_file:N execv error, cmd=/usr/bin/lpr, ret=4",
                                    std::string("3 printer_cups_print_test_page:N cannot print test page, printer id=") +
                                        kPrinter));
}

// Each platform call of a submission failed in turn: -1, lpr's failure as
// ERR_EXEC, every other as the platform set it, nothing leaked.
TEST(PrintFileFaults, EveryPlatformFailureFailsTheSubmission) {
    SweepFailures(
        [] {
            SetCupsName(kPrinter, kQueue);
            PlaceRecorder("/usr/bin/lpr", "lpr");
        },
        [] { return XAVOPrinterCupsPrintFile(kPrinter, "/tmp/doc.pdf", "title", 1); },
        [](const std::string &failed, int32_t result) {
            EXPECT_EQ(result, -1);
            EXPECT_EQ(ORLICErrGet(), failed == "ORLICExecv" ? ERR_EXEC : kInjectedCode);
        });
}

// lpq's output as CUPS prints it.
constexpr char kListingHeader[] = "usbprinter1 is not ready\n"
                                  "Rank    Owner   Job     File(s)                         Total Size\n";
constexpr char kListingJobs[] = "1st     root    123     report.pdf                      2048 bytes\n";
constexpr char kListingEmpty[] = "usbprinter1 is ready\nno entries\n";

// An lpq that prints the listing and records its runs.
void PlaceLpq(const std::string &listing) {
    PlaceFile("/tmp/lpq.out", listing);
    PlaceRecorder("/usr/bin/lpq", "lpq");
}

// A real scheduler running, for the tests whose lpq is a fake: the job
// questions are only asked of a running one.
class JobWaitListing : public ::testing::Test {
protected:
    void SetUp() override {
        Cupsd::Start();
        ASSERT_GT(Cupsd::Pid(), 0);
        SetCupsName(kPrinter, kQueue);
    }
    void TearDown() override { Cupsd::Stop(); }
};

// The job ID is looked for as raw text in the listing's lines.
TEST_F(JobWaitListing, AnswersWhetherTheJobIsListed) {
    struct { const char *szName; std::string listing; const char *szJobId; int32_t result; } const cases[] = {
        {"job listed", std::string(kListingHeader) + kListingJobs, "123", 1},
        {"job not among others", std::string(kListingHeader) + kListingJobs, "7", 0},
        {"job ID inside the printer name", kListingEmpty, "1", 1},
        {"last line without newline", "usbprinter1 is ready\n1st root 99 f 1 bytes", "99", 1},
        // A job ID that lies across the first 511 bytes of a long line is found.
        {"match across a long line", std::string(kListingHeader) + std::string(508, 'x') + "ABCDEF\n", "xxABCD", 1},
    };
    for (const auto &c : cases) {
        PlaceLpq(c.listing);
        EXPECT_EQ(XAVOPrinterCupsJobWaitComplete(kPrinter, c.szJobId), c.result) << c.szName;
        EXPECT_THAT(RecordedArgs("lpq"), ElementsAre("-P", kQueue));
        EXPECT_THAT(TakeSleeps(), IsEmpty()) << c.szName;
        // One line for a listed job (its text ends in errno's, whatever it is).
        EXPECT_THAT(Logs(), AllOf(SizeIs(c.result),
                                  Each(StartsWith("3 printer_cups_job_wait_complete:N CheckJobIdInQueue failed. ("))));
    }
    // An lpq that cannot be started: the platform's error stands.
    XavoStandinFailCall("ORLICPopen", 1, 0x0900);
    EXPECT_EQ(XAVOPrinterCupsJobWaitComplete(kPrinter, "5"), -1);
    XavoStandinReset();
    EXPECT_EQ(ORLICErrGet(), ERR_OPEN);
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_cups_job_wait_complete:N open failed. [0x0900 ")));
}

// An lpq that prints a header, interrupts its reader (its first
// iInterruptedRuns runs only; a few signals, so that one finds the reader
// blocked however slowly it got there), then prints the rest.
void PlaceInterruptingLpq(int iInterruptedRuns) {
    PlaceProgram("/usr/bin/lpq", "#!/bin/sh\n"
                                 "echo run >> /tmp/lpq.calls\n"
                                 "printf 'usbprinter1 is ready\\n'\n"
                                 "if [ $(wc -l < /tmp/lpq.calls) -le " + std::to_string(iInterruptedRuns) + " ]; then\n"
                                 "  for i in 1 2 3; do sleep 0.2; kill -USR1 " + std::to_string(getpid()) + "; done\n"
                                 "  printf '1st root 42 late.pdf 1 bytes\\n'\n"
                                 "fi\n"
                                 "printf 'no entries\\n'\n");
}

TEST_F(JobWaitListing, InterruptedListingIsTakenAgainAfterASecondAtMostThreeTimes) {
    // The fake lpq sends SIGUSR1 to the test, not to its parent, which is
    // the platform's helper that waits for it.
    InterruptingSignal interruptible(SIGUSR1);
    PlaceInterruptingLpq(1);
    // Job 42 shows only in the interrupted listing, after the
    // interruption: the call must not have read past it.
    EXPECT_EQ(XAVOPrinterCupsJobWaitComplete(kPrinter, "42"), 0);
    EXPECT_EQ(Calls("lpq"), 2);
    EXPECT_THAT(TakeSleeps(), ElementsAre(1000000u));
    EXPECT_THAT(Logs(), IsEmpty());

    PlaceInterruptingLpq(100);  // every listing from now on is interrupted
    EXPECT_EQ(XAVOPrinterCupsJobWaitComplete(kPrinter, "77"), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_EQ(Calls("lpq"), 5);
    EXPECT_THAT(TakeSleeps(), ElementsAre(1000000u, 1000000u));
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_job_wait_complete:N queue of usbprinter1 unreadable after 3 listings"));
}

// Calls refused before lpr or lpq runs: bad arguments (silently, with
// ERR_BAD_PARAMETERS), printers without a queue name, and job questions
// while no scheduler runs.
TEST(RefusedCalls, FailBeforeAnyToolRuns) {
    const std::string nameGet = "3 printer_cups_name_get:N get cups printer name failed, printer=";
    const std::string noName = "3 printer_cups_print_file:N cannot get cups printer name, printer=";
    struct {
        const char *szName;
        std::function<int32_t()> call;
        std::uint32_t code;  // 0: not checked
        std::vector<std::string> logs;
    } const cases[] = {
        {"null printer", [] { return XAVOPrinterCupsPrintFile(nullptr, "/tmp/doc.pdf", nullptr, 0); }, ERR_BAD_PARAMETERS, {}},
        {"null file", [] { return XAVOPrinterCupsPrintFile(kPrinter, nullptr, nullptr, 0); }, ERR_BAD_PARAMETERS, {}},
        {"empty test page printer", [] { return XAVOPrinterCupsPrintTestPage(""); }, ERR_BAD_PARAMETERS, {}},
        {"null job", [] { return XAVOPrinterCupsJobWaitComplete(kPrinter, nullptr); }, ERR_BAD_PARAMETERS, {}},
        {"unknown printer", [] { return XAVOPrinterCupsPrintFile("no-such-printer", "/tmp/doc.pdf", nullptr, 0); }, 0,
         {nameGet + "no-such-printer", noName + "no-such-printer"}},
        {"job of an unknown printer", [] { return XAVOPrinterCupsJobWaitComplete("other", "5"); }, 0,
         {nameGet + "other", "3 printer_cups_job_wait_complete:N get cups printer name failed, printer=other"}},
        {"job while no scheduler runs", [] { return XAVOPrinterCupsJobWaitComplete(kPrinter, "5"); }, 0,
         {"3 printer_cups_job_wait_complete:N cupsd is not running."}},
    };
    SetCupsName(kPrinter, kQueue);
    PlaceRecorder("/usr/bin/lpr", "lpr");
    PlaceLpq(kListingEmpty);
    for (const auto &c : cases) {
        SCOPED_TRACE(c.szName);
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(c.call(), -1);
        if (c.code != 0) { EXPECT_EQ(ORLICErrGet(), c.code); }
        EXPECT_EQ(Logs(), c.logs);
    }
    EXPECT_EQ(Calls("lpr"), 0);
    EXPECT_EQ(Calls("lpq"), 0);
}

TEST(CleanSpool, RemovesEveryNameWithADotAsAPlainName) {
    PlaceRecorder("/usr/bin/lprm", "lprm");
    // Names a shell would act on: run through one, they would leave
    // "pwned" files behind (in the spool or the working directory).
    const std::vector<std::string> removed = {
        "job1.ps", "a;touch pwned;.ps", "$(touch pwned2).pdf", "`touch pwned3`.txt", "x|touch pwned4.ps",
        "spaced name .pcl", "star*.ps", "quote'\".ps", "dir.d/inner", "trailing."};
    const std::vector<std::string> kept = {"noext", ".hidden", "sub/x.ps", "*", "-rf"};
    for (const auto &names : {removed, kept}) {
        for (const std::string &f : names) PlaceFile(std::string(kSpool) + "/" + f, "data");
    }
    EXPECT_EQ(XAVOPrinterCleanSpool(), 0);
    EXPECT_THAT(RecordedArgs("lprm"), ElementsAre("all"));
    for (const std::string &f : removed) EXPECT_FALSE(FileExists(std::string(kSpool) + "/" + f)) << f;
    for (const std::string &f : kept) EXPECT_TRUE(FileExists(std::string(kSpool) + "/" + f)) << f;
    EXPECT_FALSE(FileExists(std::string(kSpool) + "/dir.d"));
    char szCwd[4096] = "/";
    ASSERT_NE(getcwd(szCwd, sizeof szCwd), nullptr);
    for (const std::string &dir : {std::string(kSpool), std::string(szCwd), std::string("/"), std::string("/tmp")}) {
        for (const char *p : {"pwned", "pwned2", "pwned3", "pwned4.ps"}) EXPECT_FALSE(FileExists(dir + "/" + p)) << dir << p;
    }
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST(CleanSpool, LprmFailureIsOnlyLoggedButRmFailureFails) {
    PlaceRecorder("/usr/bin/lprm", "lprm", 1);
    for (bool bDirExists : {false, true}) {
        if (bDirExists) mkdir(kSpool, 0755);
        EXPECT_EQ(XAVOPrinterCleanSpool(), 0);
        EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_clean_spool:N lprm all failed. [0x")));
    }
    PlaceFile(std::string(kSpool) + "/job.ps", "x");
    PlaceRecorder("/bin/rm", "rm", 1);
    EXPECT_EQ(XAVOPrinterCleanSpool(), -1);
    EXPECT_THAT(RecordedArgs("rm"), ElementsAre("-rf", std::string(kSpool) + "/job.ps"));
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_clean_spool:N lprm all failed. [0x"),
                                    StartsWith("3 printer_clean_spool:N remove /var/services/printer failed. [0x")));
}

}  // namespace
