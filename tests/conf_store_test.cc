// The printer configuration store: the printer lock, the merge of a USB
// printer's section, and the CUPS printer name lookup.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <map>
#include <string>

#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using xavo::test::Logs;

namespace {

constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kLockFile[] = "/run/xavosdk/lock/lock_printer";
constexpr char kPrinter[] = "04b8:0005:SN0001";

using xavo::test::Section;

Section ReadSection(const char *szSection) { return xavo::test::ReadSection(kConf, szSection); }
void WriteSection(const char *szSection, const Section &keys) { xavo::test::WriteSection(kConf, szSection, keys); }

UsbPrinterConf Record(const char *szPrinterId) {
    UsbPrinterConf conf;
    std::memset(&conf, 0, sizeof conf);
    std::strcpy(conf.szPrinterId, szPrinterId);
    return conf;
}

// A stored section in which every key the record can carry has a value,
// plus keys the record does not carry.
const Section kStored = {
    {"producer", "Old Maker"},       {"product name", "Old Model"},   {"mode", "lpr"},
    {"autolock timer", "10"},        {"manuallock timer", "20"},      {"enable airprint", "yes"},
    {"enable google cloud print", "no"}, {"driver", "old.ppd"},       {"driver brand", "OldBrand"},
    {"usblp string id", "MFG:Old;"}, {"fit to page", "yes"},          {"cups printer name", "usbprinter1"},
    {"custom key", "kept"},
};

TEST(PrinterConfSetup, NewSectionHoldsExactlyTheNonEmptyFields) {
    UsbPrinterConf conf = Record(kPrinter);
    std::strcpy(conf.szProducer, "ACME");
    std::strcpy(conf.szProductName, "Model 100");
    std::strcpy(conf.szMode, "usbip");
    std::strcpy(conf.szUsblpStringId, "MFG:ACME;MDL:Model 100;");
    ASSERT_EQ(XAVOPrinterConfSetup(&conf, 0), 0);
    EXPECT_EQ(ReadSection(kPrinter), (Section{{"producer", "ACME"},
                                              {"product name", "Model 100"},
                                              {"mode", "usbip"},
                                              {"usblp string id", "MFG:ACME;MDL:Model 100;"}}));
    EXPECT_THAT(xavo::test::ReadFile(kConf), ::testing::HasSubstr("\tproducer = ACME\n"));
    EXPECT_THAT(Logs(), IsEmpty());
}

// An empty field leaves its stored value, unless blWriteEmpty asks to
// clear and the key is one of the four clearable ones, which a new section
// then holds empty.
TEST(PrinterConfSetup, EmptyFieldsClearOnlyTheClearableKeysAndOnlyWhenAsked) {
    const Section cleared = {{"autolock timer", ""}, {"manuallock timer", ""}, {"driver", ""}, {"driver brand", ""}};
    for (const Section &stored : {kStored, Section{}}) {
        for (int blWriteEmpty : {0, 1}) {
            xavo::test::ResetSandbox();
            if (!stored.empty()) WriteSection(kPrinter, stored);
            UsbPrinterConf conf = Record(kPrinter);
            ASSERT_EQ(XAVOPrinterConfSetup(&conf, blWriteEmpty), 0);
            Section expected = stored;
            if (blWriteEmpty) {
                for (const auto &[key, value] : cleared) expected[key] = value;
            }
            EXPECT_EQ(ReadSection(kPrinter), expected) << stored.size() << " keys, blWriteEmpty " << blWriteEmpty;
        }
    }
}

TEST(PrinterConfSetup, FilledFieldsReplaceStoredValuesAndOtherKeysSurvive) {
    WriteSection(kPrinter, kStored);
    UsbPrinterConf conf = Record(kPrinter);
    std::strcpy(conf.szDriver, "new.ppd");
    std::strcpy(conf.szFitToPage, "no");
    ASSERT_EQ(XAVOPrinterConfSetup(&conf, 0), 0);
    Section expected = kStored;
    expected["driver"] = "new.ppd";
    expected["fit to page"] = "no";
    EXPECT_EQ(ReadSection(kPrinter), expected);
}

TEST(PrinterConfSetup, NullRecordFailsWithBadParameters) {
    EXPECT_EQ(XAVOPrinterConfSetup(nullptr, 0), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), IsEmpty());
}

// Holds the printer lock from another process until told to stop.
class LockHolder {
public:
    LockHolder() {
        int ready[2];
        EXPECT_EQ(pipe(ready), 0);
        pid_ = fork();
        if (pid_ == 0) {
            mkdir("/run/xavosdk", 0755);
            mkdir("/run/xavosdk/lock", 0755);
            int fd = open(kLockFile, O_RDWR | O_CREAT, 0644);
            flock(fd, LOCK_EX);
            char c = 1;
            (void)!write(ready[1], &c, 1);
            pause();
            _exit(0);
        }
        char c;
        close(ready[1]);
        EXPECT_EQ(read(ready[0], &c, 1), 1);
        close(ready[0]);
    }
    ~LockHolder() {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }

private:
    pid_t pid_;
};

TEST(PrinterConfLock, BusyLockIsTriedAHundredTimesThenLeavesTheFileUntouched) {
    WriteSection(kPrinter, kStored);
    const std::string before = xavo::test::ReadFile(kConf);
    LockHolder holder;
    xavo::test::TakeSleeps();
    EXPECT_EQ(XAVOPrinterPrinterConfLock(), -1);
    EXPECT_EQ(xavo::test::TakeSleeps(), std::vector<std::uint64_t>(100, 50000));
    UsbPrinterConf conf = Record(kPrinter);
    std::strcpy(conf.szProducer, "New");
    EXPECT_EQ(XAVOPrinterConfSetup(&conf, 1), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_LOCK);
    EXPECT_EQ(xavo::test::ReadFile(kConf), before);
}

TEST(PrinterConfUnlock, ReleasesTheLockAndAnswersZeroForABadOrClosedDescriptor) {
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(-1), 0);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_conf_unlock:N Invaild Argument (0 <= fdLock)=[0]\n"));
    int fd = XAVOPrinterPrinterConfLock();
    ASSERT_GE(fd, 0);
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(fd), 1);
    fd = XAVOPrinterPrinterConfLock();
    ASSERT_GE(fd, 0) << "taken again at once";
    EXPECT_TRUE(xavo::test::TakeSleeps().empty());
    close(fd);
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(fd), 0);
    EXPECT_THAT(Logs(), IsEmpty());
}

// A missing section and an empty name are pinned through the print
// submission's refusals, with this line.
TEST(PrinterCupsNameGet, FindsTheStoredNameOrLogsThePrinter) {
    WriteSection(kPrinter, kStored);
    WriteSection("no-name", {{"producer", "ACME"}});
    char szName[32] = "junk";
    EXPECT_EQ(XAVOPrinterCupsNameGet(kPrinter, szName, sizeof szName), 0);
    EXPECT_STREQ(szName, "usbprinter1");
    EXPECT_EQ(XAVOPrinterCupsNameGet("no-name", szName, sizeof szName), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_name_get:N get cups printer name failed, printer=no-name"));
}

TEST(PrinterCupsNameGet, BadArgumentsFailSilentlyWithBadParameters) {
    char szName[32];
    struct {
        const char *id;
        char *buf;
        int32_t cb;
    } cases[] = {{kPrinter, szName, 0}, {kPrinter, szName, -5}, {kPrinter, nullptr, 32}, {nullptr, szName, 32}};
    for (const auto &c : cases) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterCupsNameGet(c.id, c.buf, c.cb), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    }
    EXPECT_THAT(Logs(), IsEmpty());
}

// Several processes setting up printers at once: every key of every process
// is in the file afterwards.  Each process owns some printers of its own and
// one key of a printer they all share, so a setup that merged into a stale
// copy of the shared section would drop another process's key.
TEST(PrinterConfSetup, ConcurrentProcessesLoseNothing) {
    xavo::test::SetRealSleep(true);
    constexpr int kProcesses = 8;
    constexpr int kOwnPrinters = 4;
    const char *sharedKeys[kProcesses] = {"producer", "product name", "mode", "driver",
                                          "driver brand", "usblp string id", "fit to page", "enable airprint"};
    std::vector<pid_t> children;
    for (int p = 0; p < kProcesses; ++p) {
        pid_t pid = fork();
        ASSERT_GE(pid, 0);
        if (pid == 0) {
            int failed = 0;
            for (int i = 0; i < kOwnPrinters; ++i) {
                UsbPrinterConf conf = Record(("p" + std::to_string(p) + "-" + std::to_string(i)).c_str());
                std::snprintf(conf.szProducer, sizeof conf.szProducer, "maker %d", p);
                failed |= XAVOPrinterConfSetup(&conf, 0) != 0;
            }
            UsbPrinterConf shared = Record("shared");
            char *fields[kProcesses] = {shared.szProducer, shared.szProductName, shared.szMode,
                                        shared.szDriver, shared.szDriverBrand, shared.szUsblpStringId,
                                        shared.szFitToPage, shared.szEnableAirprint};
            std::snprintf(fields[p], 8, "v%d", p);
            failed |= XAVOPrinterConfSetup(&shared, 0) != 0;
            _exit(failed);
        }
        children.push_back(pid);
    }
    for (pid_t pid : children) {
        int status = 0;
        ASSERT_EQ(waitpid(pid, &status, 0), pid);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    }
    for (int p = 0; p < kProcesses; ++p) {
        for (int i = 0; i < kOwnPrinters; ++i) {
            std::string id = "p" + std::to_string(p) + "-" + std::to_string(i);
            EXPECT_EQ(ReadSection(id.c_str()), (Section{{"producer", "maker " + std::to_string(p)}})) << id;
        }
    }
    Section shared = ReadSection("shared");
    for (int p = 0; p < kProcesses; ++p) {
        EXPECT_EQ(shared[sharedKeys[p]], "v" + std::to_string(p)) << sharedKeys[p];
    }
}

// Every platform call of a setup failed in turn: the setup fails cleanly
// (its own code or the platform's), or carries on where a failure is
// harmless, and never leaves the printer lock held.
TEST(PrinterConfSetup, EachPlatformFailureFailsCleanly) {
    xavo::test::SweepFailures(
        [] { WriteSection(kPrinter, kStored); },
        [] {
            UsbPrinterConf conf = Record(kPrinter);
            std::strcpy(conf.szProducer, "New");
            return XAVOPrinterConfSetup(&conf, 0);
        },
        [](const std::string &failed, int32_t result) {
            if (failed == "ORLICFileGetSection" || failed == "ORLICFileLockByFile") {
                // An unreadable old section is set up from the record alone;
                // a busy lock is tried again.
                EXPECT_EQ(result, 0);
            } else {
                EXPECT_LT(result, 0);
                EXPECT_THAT(ORLICErrGet(), ::testing::AnyOf(xavo::test::kInjectedCode, ERR_OUT_OF_MEMORY));
            }
            int fd = XAVOPrinterPrinterConfLock();
            EXPECT_GE(fd, 0) << "the printer lock was left held";
            XAVOPrinterPrinterConfUnlock(fd);
        });
}

}  // namespace
