// CUPS queues where the real tools cannot be made to fail: fake CUPS tools,
// injected platform failures, a scheduler stopped or unstartable (else real).
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
#include "support/paths.h"
#include "support/processes.h"
#include "support/records.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::Eq;
using ::testing::HasSubstr;
using ::testing::IsSupersetOf;
using ::testing::Matcher;
using ::testing::Not;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kA[] = "04b8:0005:SN0001";
// A program that appends its name and arguments to /tmp/runs.
std::string Recorder(int iExit) {
    return "#!/bin/sh\necho \"${0##*/} $*\" >> /tmp/runs\nexit " + std::to_string(iExit) + "\n";
}

std::vector<std::string> Runs() { return Lines(Tool({"/bin/sh", "-c", "cat /tmp/runs 2>/dev/null; rm -f /tmp/runs"})); }

// Queue creation that always succeeds, recorded, for the tests that look
// only at what it was given.
void RecordQueueCreation() {
    PlaceProgram("/usr/bin/lpadmin", Recorder(0));
    PlaceProgram("/usr/bin/cupsdisable", Recorder(0));
}

}  // namespace

XAVO_SANDBOX_PER_SUITE(CupsFaults);

class CupsFaults : public ::testing::Test {
protected:
    void SetUp() override {
        Cupsd::Start();  // also puts back the real tools a test replaced
        ASSERT_GT(Cupsd::Pid(), 0);
        Cupsd::RemoveAllQueues();
        Tool({"/bin/sh", "-c", "rm -f /tmp/runs /usr/xavo/etc/printer.conf /etc/cups/ppd/*"});
        PlaceFile(kNptab, "10.0.0.11=\"office\"\n");
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
    const std::string retry = "3 printer_cups_printer_add:N add cups printer=usbprinter1, retry(";
    EXPECT_THAT(Logs(), IsSupersetOf({StartsWith(retry + "2) ... /usr/bin/lpadmin ["), StartsWith(retry + "1) ... "),
                                      StartsWith(retry + "0) ... ")}));
    EXPECT_EQ(TakeSleeps(), (std::vector<std::uint64_t>{2000000, 2000000}));
}

// (The alias pass without the PPD is shown by the real scheduler.)
TEST_F(CupsFaults, PpdWhoseCopyCannotBeKeptIsStillGivenToTheQueue) {
    RecordQueueCreation();
    PlaceFile("/tmp/model.ppd", "*PPD-Adobe: \"4.3\"\n");
    XavoStandinFailCall("ORLICExec", 1, ERR_EXEC);  // "/bin/mkdir -p /etc/cups/ppd/"
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, "/tmp/model.ppd"), 0);
    EXPECT_THAT(Runs().front(), EndsWith(" -P /tmp/model.ppd"));
    EXPECT_THAT(Logs(), IsSupersetOf({StartsWith("3 printer_backup_ppd:N mkdir -p /etc/cups/ppd/ failed"),
                                      StartsWith("3 printer_cups_printer_add:N Failed to backup ppd file: "
                                                 "/tmp/model.ppd[0x2A00 printer_backup_ppd:")}));
}

TEST_F(CupsFaults, EnablingFollowsUsbprinter1ToItsAliasOnlyAfterSuccess) {
    struct {
        const char *szName;
        int32_t blEnable, iExit, iResult;
        std::vector<std::string> runs;
    } const cases[] = {
        {"USBPRINTER1", 1, 0, 0, {"cupsenable USBPRINTER1", "cupsenable usbprinter"}},
        {"usbprinter1", 0, 0, 0, {"cupsdisable usbprinter1", "cupsdisable usbprinter"}},
        {"usbprinter2", 7, 0, 0, {"cupsenable usbprinter2"}},
        {"usbprinter1", 1, 1, -1, {"cupsenable usbprinter1"}},
        {"", 1, 0, -1, {}},
    };
    for (const auto &c : cases) {
        for (const char *tool : {"/usr/bin/cupsenable", "/usr/bin/cupsdisable"}) PlaceProgram(tool, Recorder(c.iExit));
        EXPECT_EQ(XAVOPrinterCupsPrinterEnable(c.szName, c.blEnable), c.iResult) << c.szName;
        EXPECT_EQ(Runs(), c.runs) << c.szName;
    }
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_cups_printer_enable:N run cmd failed, "
                                               "cmd=[/usr/bin/cupsenable usbprinter1], ret=")));
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS) << "the empty name";
}

TEST_F(CupsFaults, QueueListThatCannotBeReadFailsTheChecksButNotTheNameChoice) {
    XavoStandinFailCalls("ORLICPopen", 1, -1, ERR_OPEN);
    EXPECT_EQ(XAVOPrinterCupsNameCheck(kA, "usbprinter1"), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_EQ(XAVOPrinterNetIPCheck("10.0.0.11"), -1);
    EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck("10.0.0.11", "office"), -1);
    EXPECT_TRUE(TakeSleeps().empty());  // a tool that never started is retried at once
    EXPECT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_TRUE(Queue("usbprinter1").exists);
    XavoStandinReset();
    // A signal interrupts every read: three attempts, a pause after each,
    // and the caller's errno survives.
    const InterruptingSignal interrupting(SIGUSR1);
    PlaceProgram("/usr/bin/lpstat", "#!/bin/sh\nsleep 0.2\nkill -USR1 " + std::to_string(getpid()) +
                                        "\nsleep 0.2\necho 'device for usbprinter1: usb:/dev/usb/" + kA + "'\n");
    errno = ENOTTY;
    EXPECT_EQ(XAVOPrinterCupsNameCheck(kA, "usbprinter1"), -1);
    EXPECT_EQ(errno, ENOTTY);
    EXPECT_EQ(ORLICErrGet(), ERR_EXEC);
    EXPECT_EQ(TakeSleeps(), (std::vector<std::uint64_t>{1000000, 1000000, 1000000}));
}

// A listing line names the queue after its second blank, up to the first ':'.
TEST_F(CupsFaults, NameLookupCutsQueueNamesFromListingLines) {
    struct { const char *szListing; int32_t iExpected; } const cases[] = {
        {"office\ndevice for\ndevice office: socket://10.0.0.11/\n", 0},
        {"device for office\n", 2},
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
                                    "3 printer_cups_printer_rm:N cannot find cups printer name, printer=04b8:0005:SN0001"));
    NetPrinterConf conf = NetRecord("10.0.0.11", "office", "socket");
    XavoStandinFailCall("ORLIServiceStart", 1, ERR_EXEC);
    EXPECT_EQ(XAVOPrinterNetCupsAdd(&conf, nullptr), -1);
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_net_cups_add:N start cupsd failed. [0x2A00 ")));
    // Startable: creation starts the scheduler itself and makes the queue
    // (real pauses, should lpadmin come before the scheduler listens).
    SetRealSleep(true);
    EXPECT_EQ(XAVOPrinterNetCupsAdd(&conf, nullptr), 0);
    SetRealSleep(false);
    EXPECT_EQ(Queue("office").deviceUri, "socket://10.0.0.11/");
}

// The scheduler's file as the library edits it while the scheduler is
// stopped: only blocks opened exactly by the three USB names go.
TEST_F(CupsFaults, SchedulerFileEditDropsExactlyTheUsbBlocks) {
    Cupsd::Stop();
    const std::string kept1 = "<Printer usbprinter10>\nDeviceURI usb:/dev/usb/x\n</Printer>\n";
    const std::string kept2 = "  <Printer usbprinter2>\nInfo indented\n</Printer>\n";
    const std::string head = "# Written by cupsd\nNextPrinterId 5\n";
    struct { std::string before, after; } const cases[] = {
        {head + "<Printer usbprinter1>\nDeviceURI usb:/dev/usb/a\n</Printer>\n" + kept1 +
             "<Printer usbprinter>\n</Printer> trailing\n" + kept2,
         head + kept1 + kept2},
        {head + "<Printer usbprinter2>\nInfo never closed\n" + kept1, head},
        {std::string(1500, 'x') + "\n<Printer usbprinter>\n</Printer>\n", std::string(1500, 'x') + "\n"},
    };
    for (const auto &c : cases) {
        PlaceFile(kCupsConf, c.before, 0640);
        EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), 0);
        EXPECT_EQ(ReadFile(kCupsConf), c.after);
    }
    PlaceFile(kCupsConf, head);
    XavoStandinFailCall("ORLICFileTempFileOpen", 1, ERR_OPEN);
    EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_OPEN);
    EXPECT_EQ(ReadFile(kCupsConf), head);
    unlink(kCupsConf);
    EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), 0);
    EXPECT_FALSE(FileExists(kCupsConf));
    EXPECT_TRUE(Logs().empty());
}

// The kept PPD text by name.  The name is a base name under
// "/etc/cups/ppd/": a "/" or a name whose path would not fit the 388-byte
// buffer whole is a bad argument, never read.
TEST_F(CupsFaults, KeptPpdTextAndItsErrorCodes) {
    PlaceFile("/etc/cups/ppd/x/y.ppd", "NESTED");
    struct { std::string name; const char *szContent, *szText; uint32_t uError; } const cases[] = {
        {"full", "*PPD-Adobe: \"4.3\"\n*End\n", "*PPD-Adobe: \"4.3\"\n*End\n", ERR_READ},
        {"open", "*PPD-Adobe: \"4.3\"\n*End", "*PPD-Adobe: \"4.3\"\n*End", 0},
        {"empty", "", nullptr, ERR_READ},
        {"missing", nullptr, nullptr, ERR_OPEN},
        {"../ppd/full", nullptr, nullptr, ERR_BAD_PARAMETERS},
        {"x/y", nullptr, nullptr, ERR_BAD_PARAMETERS},
        {std::string(370, 'n'), nullptr, nullptr, ERR_BAD_PARAMETERS},  // 388 bytes with its NUL
        {std::string(369, 'n'), nullptr, nullptr, ERR_OPEN},            // fits whole; no such file
    };
    for (const auto &c : cases) {
        if (c.szContent) PlaceFile("/etc/cups/ppd/" + c.name + ".ppd", c.szContent);
        ORLICErrSetEx(0, "", 0);
        char *szText = XAVOCupsGetPPD(c.name.c_str());
        EXPECT_EQ(szText == nullptr ? "(null)" : std::string(szText), c.szText ? c.szText : "(null)")
            << c.name.substr(0, 20);
        EXPECT_EQ(ORLICErrGet(), c.uError) << c.name.substr(0, 20);
        std::free(szText);
    }
    EXPECT_EQ(XAVOCupsGetPPD(nullptr), nullptr);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_TRUE(Logs().empty());
}

namespace {
// Every .ppd file under the kept copies' directory and /tmp, sorted.
std::vector<std::string> PpdFiles() {
    return Lines(Tool({"/bin/sh", "-c", "find /etc/cups/ppd /tmp -name '*.ppd' | sort"}));
}
}  // namespace

// A printer ID that holds "/" or a pattern character, or is too long for the
// copy's path, gets no kept copy: the copy fails as a bad argument, nothing
// is written anywhere, and the queue is made from the caller's file.
// Without a file from the caller, no copy is looked for under such an ID: a
// file planted where its path leads is never handed to the queue.
TEST_F(CupsFaults, PpdCopyIsNeitherKeptNorLookedForUnderIdsThatCannotNameOne) {
    const std::string kName = "((void *)0) == strpbrk(szPrinterId, \"/*?[\")";
    const std::string kFits =
        "sizeof(szDest) > snprintf(szDest, sizeof(szDest), \"/etc/cups/ppd/%s.ppd\", szPrinterId)";
    struct { std::string id; bool bNet; std::string condition; } const cases[] = {
        {"04b8:0005:SN*", false, kName},
        {"04b8:0005:SN?001", false, kName},
        {"04b8:0005:SN[0]001", false, kName},
        {"04b8:0005:x/../../../../tmp/stolen", false, kName},  // the directory exists: cp would write there
        {"04b8:0005:" + std::string(228, 'L'), false, kFits},     // the path needs 257 bytes: cut, ".ppd" is lost
        {"10.0.0.5-of?ice", true, kName},
    };
    RecordQueueCreation();
    PlaceFile("/tmp/new.ppd", "*PPD-Adobe: \"4.3\"\n");
    const std::vector<std::string> kPlanted = {"/etc/cups/ppd/04b8:0005:SN0001.ppd", "/etc/cups/ppd/10.0.0.5-office.ppd",
                                               "/etc/cups/ppd/04b8:0005:SN*.ppd", "/tmp/stolen.ppd"};
    for (const std::string &path : kPlanted) PlaceFile(path, "PLANTED");
    PlaceFile("/etc/cups/ppd/04b8:0005:x/placeholder", "");
    const std::vector<std::string> before = PpdFiles();
    for (const auto &c : cases) {
        SCOPED_TRACE(c.id.substr(0, 40));
        NetPrinterConf conf = NetRecord("10.0.0.5", "of?ice", "socket");
        for (const char *szPpd : {"/tmp/new.ppd", static_cast<const char *>(nullptr)}) {
            EXPECT_EQ(c.bNet ? XAVOPrinterNetCupsAdd(&conf, szPpd) : XAVOPrinterCupsAdd(c.id.c_str(), szPpd), 0);
            EXPECT_THAT(Runs().front(), szPpd ? Matcher<std::string>(EndsWith(" -P /tmp/new.ppd"))
                                              : Matcher<std::string>(Not(HasSubstr(" -P "))));
        }
        const std::string unit = c.bNet ? "printer_net_cups_add" : "printer_cups_printer_add";
        const std::string refused = "3 printer_backup_ppd:N Invaild Argument (" + c.condition + ")=[0]\n";
        const std::string failed =
            "3 " + unit + ":N Failed to backup ppd file: /tmp/new.ppd[0x0D00 printer_backup_ppd:";
        EXPECT_THAT(Logs(), IsSupersetOf<std::vector<Matcher<std::string>>>({Eq(refused), StartsWith(failed)}));
        EXPECT_EQ(PpdFiles(), before);
    }
    for (const std::string &path : kPlanted) EXPECT_EQ(ReadFile(path), "PLANTED") << path;
    // The longest ID whose copy fits is still kept, and serves the next creation.
    const std::string fits = "04b8:0005:" + std::string(227, 'L');
    EXPECT_EQ(XAVOPrinterCupsAdd(fits.c_str(), "/tmp/new.ppd"), 0);
    EXPECT_EQ(ReadFile("/etc/cups/ppd/" + fits + ".ppd"), "*PPD-Adobe: \"4.3\"\n");
    Runs();
    EXPECT_EQ(XAVOPrinterCupsAdd(fits.c_str(), nullptr), 0);
    EXPECT_THAT(Runs().front(), EndsWith(" -P /etc/cups/ppd/" + fits + ".ppd"));
}
