// CUPS queues where the real tools cannot be made to fail: fake lpadmin,
// lpstat, cupsenable and cupsdisable at the library's paths, platform
// failures injected, and a scheduler that is stopped or cannot start.  A
// real scheduler runs beside them, so that the platform sees "cupsd".
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <vector>

#include "appliance/standin_control.h"
#include "sandbox/cupsd.h"
#include "support/cases.h"
#include "support/logs.h"
#include "support/records.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::StartsWith;
using xavo::test::Cupsd;
using xavo::test::Logs;
using xavo::test::PlaceFile;
using xavo::test::PlaceProgram;
using xavo::test::ReadFile;
using xavo::test::TakeSleeps;

namespace {

constexpr char kA[] = "04b8:0005:SN0001";
constexpr char kPrintersConf[] = "/etc/cups/printers.conf";
// Every run of the program appends its name and arguments to the record.
constexpr char kRecord[] = "/tmp/runs";

std::string Recorder(int iExit) {
    return "#!/bin/sh\necho \"${0##*/} $*\" >> /tmp/runs\nexit " + std::to_string(iExit) + "\n";
}

std::vector<std::string> Runs() {
    std::vector<std::string> out = xavo::test::Lines(ReadFile(kRecord));
    unlink(kRecord);
    return out;
}

std::vector<std::string> LinesWith(const std::string &needle) {
    std::vector<std::string> out;
    for (const std::string &line : Logs()) {
        if (line.find(needle) != std::string::npos) out.push_back(line);
    }
    return out;
}

void OnSignal(int) {}

}  // namespace

XAVO_SANDBOX_PER_SUITE(CupsFaults);

class CupsFaults : public ::testing::Test {
protected:
    void SetUp() override {
        Cupsd::Start();  // also puts back the real tools a test replaced
        ASSERT_GT(Cupsd::Pid(), 0);
        Cupsd::RemoveAllQueues();
        xavo::test::Tool({"/bin/sh", "-c", "rm -f /tmp/runs /usr/xavo/etc/printer.conf /etc/cups/ppd/*"});
        PlaceFile("/usr/xavo/etc/nptab", "10.0.0.11=\"office\"\n");
        XavoStandinReset();
        ORLICErrSetEx(0, "", 0);
        Logs();
        TakeSleeps();
    }
    static void TearDownTestSuite() { Cupsd::Stop(); }
};

// USB and network creation share the lpadmin loop: one of them here.
TEST_F(CupsFaults, LpadminIsTriedThreeTimesTwoSecondsApart) {
    PlaceProgram("/usr/bin/lpadmin", Recorder(3));
    EXPECT_EQ(XAVOPrinterCupsAdd(kA, nullptr), -1);
    EXPECT_EQ(Runs().size(), 3u);
    std::vector<std::string> retries = LinesWith("retry(");
    ASSERT_EQ(retries.size(), 3u);
    for (int i = 0; i < 3; ++i) {
        EXPECT_THAT(retries[i], StartsWith("3 printer_cups_printer_add:N add cups printer=usbprinter1, retry(" +
                                           std::to_string(2 - i) + ") ... /usr/bin/lpadmin ["));
    }
    EXPECT_EQ(TakeSleeps(), (std::vector<std::uint64_t>{2000000, 2000000}));
}

// The vector of each pass, as lpadmin receives it: the alias pass drops
// "-P"; a PPD whose copy cannot be kept is still given to the queue.
TEST_F(CupsFaults, AliasPassHasNoPpdAndAFailedCopyStillInstallsTheGivenFile) {
    char szHost[64] = {};
    gethostname(szHost, sizeof szHost - 1);
    std::string tail = std::string(" -E -v usb:/dev/usb/") + kA + " -L " + szHost;
    PlaceProgram("/usr/bin/lpadmin", Recorder(0));
    PlaceProgram("/usr/bin/cupsdisable", Recorder(0));
    PlaceFile("/tmp/model.ppd", "*PPD-Adobe: \"4.3\"\n");
    XavoStandinFailCall("ORLICExec", 1, ERR_EXEC);  // "/bin/mkdir -p /etc/cups/ppd/"
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, "/tmp/model.ppd"), 0);
    EXPECT_THAT(Runs(), ElementsAre("lpadmin -p usbprinter1" + tail + " -P /tmp/model.ppd",
                                    "cupsdisable usbprinter1", "cupsdisable usbprinter",
                                    "lpadmin -p usbprinter" + tail, "cupsdisable usbprinter"));
    EXPECT_THAT(LinesWith("ppd"), ElementsAre("3 printer_backup_ppd:N mkdir -p /etc/cups/ppd/ failed",
                                              StartsWith("3 printer_cups_printer_add:N Failed to backup ppd file: "
                                                         "/tmp/model.ppd[0x2A00 printer_backup_ppd:")));
}

TEST_F(CupsFaults, EnablingFollowsUsbprinter1ToItsAliasOnlyAfterSuccess) {
    struct Case {
        const char *szName;
        int32_t blEnable;
        int iExit;
        int32_t iResult;
        std::vector<std::string> runs;
    } const cases[] = {
        {"USBPRINTER1", 1, 0, 0, {"cupsenable USBPRINTER1", "cupsenable usbprinter"}},
        {"usbprinter1", 0, 0, 0, {"cupsdisable usbprinter1", "cupsdisable usbprinter"}},
        {"usbprinter2", 7, 0, 0, {"cupsenable usbprinter2"}},
        {"usbprinter1", 1, 1, -1, {"cupsenable usbprinter1"}},
    };
    for (const Case &c : cases) {
        PlaceProgram("/usr/bin/cupsenable", Recorder(c.iExit));
        PlaceProgram("/usr/bin/cupsdisable", Recorder(c.iExit));
        EXPECT_EQ(XAVOPrinterCupsPrinterEnable(c.szName, c.blEnable), c.iResult) << c.szName;
        EXPECT_EQ(Runs(), c.runs) << c.szName;
    }
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_cups_printer_enable:N run cmd failed, "
                                               "cmd=[/usr/bin/cupsenable usbprinter1], ret=")));
    EXPECT_EQ(XAVOPrinterCupsPrinterEnable("", 1), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
}

TEST_F(CupsFaults, QueueListThatCannotBeReadFailsTheChecksButNotTheNameChoice) {
    XavoStandinFailCalls("ORLICPopen", 1, -1, ERR_OPEN);
    EXPECT_EQ(XAVOPrinterCupsNameCheck(kA, "usbprinter1"), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_EQ(XAVOPrinterNetIPCheck("10.0.0.11"), -1);
    EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck("10.0.0.11", "office"), -1);
    EXPECT_TRUE(TakeSleeps().empty());  // a tool that never started is retried at once
    PlaceProgram("/usr/bin/lpadmin", Recorder(0));
    PlaceProgram("/usr/bin/cupsdisable", Recorder(0));
    EXPECT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_THAT(Runs().front(), StartsWith("lpadmin -p usbprinter1 "));
    XavoStandinReset();

    // A signal interrupts every read: three attempts, a pause after each,
    // and the caller's errno survives.
    struct sigaction action {};
    action.sa_handler = OnSignal;  // no SA_RESTART: the read returns EINTR
    struct sigaction old {};
    sigaction(SIGUSR1, &action, &old);
    PlaceProgram("/usr/bin/lpstat", "#!/bin/sh\nsleep 0.2\nkill -USR1 " + std::to_string(getpid()) +
                                        "\nsleep 0.2\necho 'device for usbprinter1: usb:/dev/usb/" + kA + "'\n");
    errno = ENOTTY;
    EXPECT_EQ(XAVOPrinterCupsNameCheck(kA, "usbprinter1"), -1);
    EXPECT_EQ(errno, ENOTTY);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_EQ(TakeSleeps(), (std::vector<std::uint64_t>{1000000, 1000000, 1000000}));
    sigaction(SIGUSR1, &old, nullptr);
}

// The queue name is cut from each listing line: after the second blank, up
// to the first ':'.  Lines without two blanks name no queue.
TEST_F(CupsFaults, NameLookupCutsQueueNamesFromListingLines) {
    struct {
        const char *szListing;
        int32_t iExpected;
    } const cases[] = {
        {"office\ndevice for\ndevice office: socket://10.0.0.11/\n", 0},
        {"device for office\n", 2},
        {"device for offices: socket://10.0.0.11/\ndevice for office: lpd://10.0.0.12/\n", 2},
        {"  device for office: socket://10.0.0.11/  \n", 1},
        {"a b office:socket://10.0.0.11/q\ndevice for office: lpd://10.0.0.12/\n", 1},
    };
    for (const auto &c : cases) {
        PlaceProgram("/usr/bin/lpstat", std::string("#!/bin/sh\nprintf '") + c.szListing + "'\n");
        EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck("10.0.0.11", "office"), c.iExpected) << c.szListing;
    }
}

TEST_F(CupsFaults, StoppedSchedulerIsReportedByChecksAndStartedByCreation) {
    Cupsd::Stop();
    EXPECT_EQ(XAVOPrinterCupsNameCheck(kA, "usbprinter1"), 0);
    EXPECT_EQ(XAVOPrinterNetIPCheck("10.0.0.11"), 1);
    EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck("10.0.0.11", "office"), 0);
    EXPECT_EQ(ORLICErrGet(), 0u);
    EXPECT_EQ(XAVOPrinterCupsRm(kA), -1);  // never removes what it cannot check
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_name_check:N cupsd is not running.",
                                    "7 printer_net_ip_check:N cupsd is not running.",
                                    "3 printer_net_cups_name_and_ip_check:N cupsd is not running.",
                                    StartsWith("3 printer_cups_name_get:N"),
                                    std::string("3 printer_cups_printer_rm:N cannot find cups printer name, printer=") +
                                        kA));

    NetPrinterConf conf = xavo::test::NetRecord("10.0.0.11", "office", "socket");
    XavoStandinFailCall("ORLIServiceStart", 1, ERR_EXEC);
    EXPECT_EQ(XAVOPrinterNetCupsAdd(&conf, nullptr), -1);
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_net_cups_add:N start cupsd failed. [0x2A00 ")));

    // Startable: creation starts the scheduler itself and makes the queue
    // (real pauses, should lpadmin come before the scheduler listens).
    xavo::test::SetRealSleep(true);
    EXPECT_EQ(XAVOPrinterNetCupsAdd(&conf, nullptr), 0);
    xavo::test::SetRealSleep(false);
    EXPECT_GT(Cupsd::Pid(), 0);
    EXPECT_EQ(xavo::test::Queue("office").deviceUri, "socket://10.0.0.11/");
}

// The scheduler's file as the library edits it while the scheduler is
// stopped: only blocks opened exactly by the three USB names go.
TEST_F(CupsFaults, SchedulerFileEditDropsExactlyTheUsbBlocks) {
    Cupsd::Stop();
    const std::string kept1 = "<Printer usbprinter10>\nDeviceURI usb:/dev/usb/x\n</Printer>\n";
    const std::string kept2 = "  <Printer usbprinter2>\nInfo indented\n</Printer>\n";
    const std::string head = "# Written by cupsd\nNextPrinterId 5\n";
    struct {
        std::string before;
        std::string after;
    } const cases[] = {
        {head + "<Printer usbprinter1>\nDeviceURI usb:/dev/usb/a\n</Printer>\n" + kept1 +
             "<Printer usbprinter>\n</Printer> trailing\n" + kept2,
         head + kept1 + kept2},
        {head + "<Printer usbprinter2>\nInfo never closed\n" + kept1, head},
        {std::string(1500, 'x') + "\n<Printer usbprinter>\n</Printer>\n", std::string(1500, 'x') + "\n"},
    };
    for (const auto &c : cases) {
        PlaceFile(kPrintersConf, c.before, 0640);
        EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), 0);
        EXPECT_EQ(ReadFile(kPrintersConf), c.after);
    }

    PlaceFile(kPrintersConf, head);
    XavoStandinFailCall("ORLICFileTempFileOpen", 1, ERR_OPEN);
    EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_OPEN);
    EXPECT_EQ(ReadFile(kPrintersConf), head);

    unlink(kPrintersConf);
    EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), 0);
    EXPECT_FALSE(xavo::test::FileExists(kPrintersConf));
    EXPECT_TRUE(Logs().empty());
}

TEST_F(CupsFaults, KeptPpdTextAndItsErrorCodes) {
    struct {
        const char *szName;
        const char *szContent;  // nullptr: no file
        const char *szText;     // nullptr: no text returned
        uint32_t uError;
    } const cases[] = {
        {"full", "*PPD-Adobe: \"4.3\"\n*End\n", "*PPD-Adobe: \"4.3\"\n*End\n", ERR_READ},
        {"open", "*PPD-Adobe: \"4.3\"\n*End", "*PPD-Adobe: \"4.3\"\n*End", 0},
        {"empty", "", nullptr, ERR_READ},
        {"missing", nullptr, nullptr, ERR_OPEN},
    };
    for (const auto &c : cases) {
        if (c.szContent) PlaceFile(std::string("/etc/cups/ppd/") + c.szName + ".ppd", c.szContent);
        ORLICErrSetEx(0, "", 0);
        char *szText = XAVOCupsGetPPD(c.szName);
        EXPECT_EQ(szText == nullptr ? "(null)" : std::string(szText), c.szText ? c.szText : "(null)") << c.szName;
        EXPECT_EQ(ORLICErrGet(), c.uError) << c.szName;
        std::free(szText);
    }
    EXPECT_EQ(XAVOCupsGetPPD(nullptr), nullptr);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
}
