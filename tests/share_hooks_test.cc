// The USB/IP sharing hooks: the lock status and queue text read from the
// sharing service's status file, and the driver binding tool's argument
// vectors.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "support/cases.h"
#include "support/logs.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using xavo::test::CaseName;
using xavo::test::Logs;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";

void PlaceStatus(const std::string &szPrinterId, const std::string &content) {
    xavo::test::PlaceFile("/tmp/usbip_" + szPrinterId, content);
}

// The driver binding tool, recording its arguments.
void PlaceBindDriver(int iExit = 0) { xavo::test::PlaceRecorder("/usr/bin/bind_driver", "bind_driver", iExit); }
std::vector<std::string> RecordedArgs() { return xavo::test::RecordedArgs("bind_driver"); }

// ---- lock status ------------------------------------------------------

struct LockCase {
    const char *szName;
    const char *szPrinterId;
    const char *szStatusFile;  // nullptr: no status file
    int32_t cbBuf;
    const char *szExpected;
};

const LockCase kLockCases[] = {
    {"service's text passed through", kPrinter, "QUEUE=\"q (x)\"\nLOCK=\"Locked by 10.0.0.7\"\n", 64,
     "Locked by 10.0.0.7"},
    {"no status file is free", kPrinter, nullptr, 64, "Free"},
    {"free cut to a 3-byte buffer", kPrinter, nullptr, 3, "Fr"},
    {"file without the key is free", kPrinter, "QUEUE=\"q (x)\"\n", 64, "Free"},
    {"empty printer ID reads the bare prefix", "", "LOCK=\"Busy\"\n", 64, "Busy"},
};

class UsbipLockStatus : public ::testing::TestWithParam<LockCase> {};

TEST_P(UsbipLockStatus, AnswersZeroWithTheStatusOrFree) {
    const LockCase &c = GetParam();
    if (c.szStatusFile) PlaceStatus(c.szPrinterId, c.szStatusFile);
    char szBuf[64];
    std::memset(szBuf, 'x', sizeof szBuf);
    EXPECT_EQ(XAVOPrinterUsbipGetLockStatus(c.szPrinterId, szBuf, c.cbBuf), 0);
    EXPECT_STREQ(szBuf, c.szExpected);
    EXPECT_THAT(Logs(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Files, UsbipLockStatus, ::testing::ValuesIn(kLockCases), CaseName());

// ---- driver binding tool -----------------------------------------------

using Hook = int32_t (*)(const char *);

struct ToolCase {
    const char *szName;
    Hook hook;
    std::vector<std::string> (*args)(const std::string &id);
    std::string (*failureLog)(const std::string &id);
};

const ToolCase kToolCases[] = {
    {"eject", XAVOPrinterUsbipEject, [](const std::string &id) { return std::vector<std::string>{"-z", id}; },
     [](const std::string &id) { return "3 usbip_eject:N release usb ap lock failed, printerId=" + id; }},
    {"lock_release", XAVOPrinterUsbipLockRelease,
     [](const std::string &id) { return std::vector<std::string>{"-p", id, "-0", "0", "-n", "USBIP"}; },
     [](const std::string &id) {
         return "3 usbip_lock_release:N release usb ap lock failed, cmd=/usr/bin/bind_driver -p " + id +
                " -0 0 -n USBIP";
     }},
};

// Printer IDs reach the tool as one argument each, unchanged, whatever
// they hold.
const char *const kToolPrinterIds[] = {kPrinter, "04b8:0005:SN 0001 spaced", "x;touch /tmp/pwned;$(id)"};

class UsbipTool : public ::testing::TestWithParam<ToolCase> {};

TEST_P(UsbipTool, PassesThePrinterIdAsOneArgument) {
    const ToolCase &c = GetParam();
    PlaceBindDriver();
    for (const char *id : kToolPrinterIds) {
        EXPECT_EQ(c.hook(id), 0) << id;
        EXPECT_THAT(RecordedArgs(), ElementsAreArray(c.args(id))) << id;
    }
    EXPECT_FALSE(xavo::test::FileExists("/tmp/pwned"));
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST_P(UsbipTool, BadPrinterIdNeverRunsTheToolAndItsFailureOrAbsenceFails) {
    const ToolCase &c = GetParam();
    EXPECT_EQ(c.hook(kPrinter), -1);  // no tool at all
    PlaceBindDriver(3);
    for (const char *id : {static_cast<const char *>(nullptr), ""}) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(c.hook(id), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    }
    EXPECT_EQ(xavo::test::Calls("bind_driver"), 0);
    EXPECT_EQ(c.hook(kPrinter), -1);
    EXPECT_THAT(RecordedArgs(), ElementsAreArray(c.args(kPrinter)));
    EXPECT_THAT(Logs(), ElementsAre(c.failureLog(kPrinter), c.failureLog(kPrinter)));
}

INSTANTIATE_TEST_SUITE_P(Hooks, UsbipTool, ::testing::ValuesIn(kToolCases), CaseName());

// ---- queue text ---------------------------------------------------------

struct QueueCase {
    const char *szName;
    const char *szQueue;
    int32_t cbBuf;
    const char *szExpected;
    bool bRefineLogged;
};

const QueueCase kQueueCases[] = {
    {"no remark copied", "Printer queue", 64, "Printer queue", false},
    {"short remark replaced, parenthesis kept", "Ready (3 jobs)", 64, "Ready (CUPS Jobs)", false},
    {"long remark keeps its tail", "Ready (waiting for host)", 64, "Ready (CUPS Jobsg for host)", false},
    {"empty remark", "Queue () end", 64, "Queue (CUPS Jobs) end", false},
    {"first remark only is the tag", "A (bc) D (ef)", 64, "A (CUPS Jobs) D (ef)", false},
    {"unclosed remark raw", "Jobs (usbip", 64, "Jobs (usbip", true},
    {"closing before opening raw", "a) b (c", 64, "a) b (c", true},
    {"one-byte buffer", "Ready (3 jobs)", 1, "", false},
};

class QueueGet : public ::testing::TestWithParam<QueueCase> {};

TEST_P(QueueGet, RewritesTheRemarkToNameTheCupsJobs) {
    const QueueCase &c = GetParam();
    PlaceStatus(kPrinter, std::string("LOCK=\"Free\"\nQUEUE=\"") + c.szQueue + "\"\n");
    char szBuf[64];
    std::memset(szBuf, 'x', sizeof szBuf);
    EXPECT_EQ(XAVOPrinterQueueGet(kPrinter, szBuf, c.cbBuf), 0);
    EXPECT_STREQ(szBuf, c.szExpected);
    std::vector<std::string> logs = Logs();
    if (c.bRefineLogged) {
        EXPECT_THAT(logs, ElementsAre("3 printer_queue_get:N cannot refine printer queue name"));
    } else {
        // A buffer too small for the rewrite may be refused by the
        // replacement and fall back to the raw value; nothing else is
        // logged.
        for (const std::string &l : logs) EXPECT_EQ(l, "3 printer_queue_get:N cannot refine printer queue name");
    }
}

INSTANTIATE_TEST_SUITE_P(Values, QueueGet, ::testing::ValuesIn(kQueueCases), CaseName());

TEST(QueueGetFailures, UnreadableStatusFailsWithTheLookupsLine) {
    char szBuf[64];
    EXPECT_EQ(XAVOPrinterQueueGet(kPrinter, szBuf, sizeof szBuf), -1);
    PlaceStatus(kPrinter, "LOCK=\"Free\"\n");
    EXPECT_EQ(XAVOPrinterQueueGet(kPrinter, szBuf, sizeof szBuf), -1);
    const std::string line = std::string("3 printer_queue_get:N get queue failed, printer=") + kPrinter;
    EXPECT_THAT(Logs(), ElementsAre(line, line));
}

// Both status readers refuse bad arguments with ERR_BAD_PARAMETERS: the
// queue text logs the failed condition, the lock status logs nothing (and
// takes an empty printer ID, which reads the bare prefix).
TEST(StatusArguments, BadArgumentsFailWithBadParameters) {
    char szBuf[16];
    struct {
        const char *id;
        char *buf;
        int32_t cb;
        const char *szCondition;
    } cases[] = {{nullptr, szBuf, 16, "((void *)0) != szPrinterId"},
                 {"", szBuf, 16, "0 != szPrinterId[0]"},
                 {kPrinter, nullptr, 16, "((void *)0) != szBuf"},
                 {kPrinter, szBuf, 0, "0 < cbBuf"},
                 {kPrinter, szBuf, -3, "0 < cbBuf"}};
    for (const auto &c : cases) {
        SCOPED_TRACE(c.szCondition);
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterQueueGet(c.id, c.buf, c.cb), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        EXPECT_THAT(Logs(), ElementsAre(std::string("3 printer_queue_get:N Invaild Argument (") + c.szCondition +
                                        ")=[0]\n"));
        if (c.id != nullptr && c.id[0] == '\0') continue;
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterUsbipGetLockStatus(c.id, c.buf, c.cb), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        EXPECT_THAT(Logs(), IsEmpty());
    }
}

}  // namespace
