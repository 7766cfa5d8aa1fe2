// The USB/IP sharing hooks: the lock status and queue text read from the sharing
// service's status file, and the driver binding tool's argument vectors.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "support/cases.h"
#include "support/logs.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using xavo::test::Logs;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";

void PlaceStatus(const std::string &szPrinterId, const std::string &content) {
    xavo::test::PlaceFile("/tmp/usbip_" + szPrinterId, content);
}

TEST(UsbipLockStatus, AnswersZeroWithTheServicesTextOrFree) {
    const std::string longest(4084, 'l');  // the longest ID whose status path fits
    struct {
        const char *szPrinterId;
        const char *szStatusFile;  // nullptr: no status file
        int32_t cbBuf;
        const char *szExpected;
    } cases[] = {
        {kPrinter, nullptr, 64, "Free"},
        {kPrinter, nullptr, 3, "Fr"},
        {kPrinter, "QUEUE=\"q (x)\"\nLOCK=\"Locked by 10.0.0.7\"\n", 64, "Locked by 10.0.0.7"},
        {kPrinter, "QUEUE=\"q (x)\"\n", 64, "Free"},  // no LOCK key
        {"", "LOCK=\"Busy\"\n", 64, "Busy"},          // an empty printer ID reads the bare prefix
        {longest.c_str(), nullptr, 64, "Free"},
    };
    for (const auto &c : cases) {
        if (c.szStatusFile) PlaceStatus(c.szPrinterId, c.szStatusFile);
        std::string buf(64, 'x');
        EXPECT_EQ(XAVOPrinterUsbipGetLockStatus(c.szPrinterId, buf.data(), c.cbBuf), 0);
        EXPECT_STREQ(buf.c_str(), c.szExpected);
    }
    EXPECT_THAT(Logs(), IsEmpty());
}

// How a hook runs the tool: "" in args stands for the printer ID, which its failure line has after logHead.
struct ToolCase {
    const char *szName;
    int32_t (*hook)(const char *);
    std::vector<std::string> args;
    std::string logHead, logTail;

    std::vector<std::string> Args(const std::string &id) const {
        std::vector<std::string> out = args;
        for (std::string &a : out) a = a.empty() ? id : a;
        return out;
    }
    std::string Log(const std::string &id) const { return logHead + id + logTail; }
};

const ToolCase kToolCases[] = {
    {"eject", XAVOPrinterUsbipEject, {"-z", ""}, "3 usbip_eject:N release usb ap lock failed, printerId=", ""},
    {"lock_release", XAVOPrinterUsbipLockRelease, {"-p", "", "-0", "0", "-n", "USBIP"},
     "3 usbip_lock_release:N release usb ap lock failed, cmd=/usr/bin/bind_driver -p ", " -0 0 -n USBIP"},
};

class UsbipTool : public ::testing::TestWithParam<ToolCase> {};

// Printer IDs reach the tool as one argument each, unchanged, whatever they hold.
TEST_P(UsbipTool, PassesThePrinterIdAsOneArgument) {
    const ToolCase &c = GetParam();
    xavo::test::PlaceRecorder("/usr/bin/bind_driver", "bind_driver");
    for (const char *id : {kPrinter, "04b8:0005:SN 0001 spaced", "x;touch /tmp/pwned;$(id)"}) {
        EXPECT_EQ(c.hook(id), 0) << id;
        EXPECT_THAT(xavo::test::RecordedArgs("bind_driver"), ElementsAreArray(c.Args(id))) << id;
    }
    EXPECT_FALSE(xavo::test::FileExists("/tmp/pwned"));
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST_P(UsbipTool, BadPrinterIdNeverRunsTheToolAndItsFailureOrAbsenceFails) {
    const ToolCase &c = GetParam();
    EXPECT_EQ(c.hook(kPrinter), -1);  // no tool at all
    xavo::test::PlaceRecorder("/usr/bin/bind_driver", "bind_driver", 3);
    for (const char *id : {static_cast<const char *>(nullptr), ""}) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(c.hook(id), -1);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    }
    EXPECT_EQ(xavo::test::Calls("bind_driver"), 0);
    EXPECT_EQ(c.hook(kPrinter), -1);
    EXPECT_THAT(xavo::test::RecordedArgs("bind_driver"), ElementsAreArray(c.Args(kPrinter)));
    EXPECT_THAT(Logs(), ElementsAre(c.Log(kPrinter), c.Log(kPrinter)));
}

INSTANTIATE_TEST_SUITE_P(Hooks, UsbipTool, ::testing::ValuesIn(kToolCases), xavo::test::CaseName());

TEST(QueueGet, RewritesTheFirstRemarkToNameTheCupsJobs) {
    const std::string refine = "3 printer_queue_get:N cannot refine printer queue name";
    struct {
        const char *szQueue;
        int32_t cbBuf;
        const char *szExpected;
        bool bRefineLogged;  // a malformed remark: the raw text, logged
    } cases[] = {
        {"Printer queue", 64, "Printer queue", false},
        {"Ready (3 jobs)", 64, "Ready (CUPS Jobs)", false},
        {"Ready (waiting for host)", 64, "Ready (CUPS Jobsg for host)", false},  // a long remark keeps its tail
        {"Queue () end", 64, "Queue (CUPS Jobs) end", false},
        {"A (bc) D (ef)", 64, "A (CUPS Jobs) D (ef)", false},
        {"Jobs (usbip", 64, "Jobs (usbip", true},
        {"Ready (3 jobs)", 1, "", false},
    };
    for (const auto &c : cases) {
        PlaceStatus(kPrinter, std::string("LOCK=\"Free\"\nQUEUE=\"") + c.szQueue + "\"\n");
        std::string buf(64, 'x');
        EXPECT_EQ(XAVOPrinterQueueGet(kPrinter, buf.data(), c.cbBuf), 0);
        EXPECT_STREQ(buf.c_str(), c.szExpected);
        // A buffer too small for the rewrite may fall back to the raw value
        // with the same line; nothing else is ever logged.
        const std::vector<std::string> logs = Logs();
        for (const std::string &l : logs) EXPECT_EQ(l, refine);
        EXPECT_TRUE(!c.bRefineLogged || logs.size() == 1) << c.szQueue;
    }
}

// Calls of the two status readers that fail.  The status file's path is
// built from the printer ID: one that holds "/" or would be cut to fit the
// path's buffer is refused, never read (a cut queue-text path, 256 bytes,
// would read another printer's file).  The queue text logs the failed
// condition; the lock status logs nothing and takes an empty printer ID,
// which reads the bare prefix.
struct FailedRead {
    const char *szName;
    int32_t (*reader)(const char *, char *, int32_t);
    const char *szId;
    bool bNullBuf;
    int32_t cbBuf;
    const char *szStatusFile;  // nullptr: none
    std::uint32_t uError;      // 0: not checked
    std::vector<std::string> logs;
};

std::vector<std::string> Refused(const std::string &condition) {
    return {"3 printer_queue_get:N Invaild Argument (" + condition + ")=[0]\n"};
}

TEST(StatusReaders, FailWithTheirErrorAndLeaveTheBufferAlone) {
    const std::string fitsQueue(244, 'q');  // "/tmp/usbip_" + 244: 255 characters, fits 256 bytes
    // Written in place: the name leaves no room for a temporary file's suffix.
    std::FILE *other = std::fopen(("/tmp/usbip_" + fitsQueue).c_str(), "w");
    ASSERT_NE(other, nullptr);
    std::fputs("QUEUE=\"other printer\"\n", other);
    std::fclose(other);
    xavo::test::PlaceFile("/tmp/usbip_dir/x", "QUEUE=\"elsewhere\"\nLOCK=\"Locked\"\n");
    const std::string slash = "((void *)0) == strchr(szPrinterId, '/')";
    const std::string queueGetFailed = std::string("3 printer_queue_get:N get queue failed, printer=") + kPrinter;
    const std::string cutQueue = fitsQueue + "q", cutLock(4085, 'l');
    const auto queue = XAVOPrinterQueueGet;
    const auto lock = XAVOPrinterUsbipGetLockStatus;
    const FailedRead cases[] = {
        {"queue: null ID", queue, nullptr, false, 64, nullptr, ERR_BAD_PARAMETERS, Refused("((void *)0) != szPrinterId")},
        {"queue: empty ID", queue, "", false, 64, nullptr, ERR_BAD_PARAMETERS, Refused("0 != szPrinterId[0]")},
        {"queue: null buffer", queue, kPrinter, true, 64, nullptr, ERR_BAD_PARAMETERS, Refused("((void *)0) != szBuf")},
        {"queue: no room", queue, kPrinter, false, 0, nullptr, ERR_BAD_PARAMETERS, Refused("0 < cbBuf")},
        {"queue: slash", queue, "dir/x", false, 64, nullptr, ERR_BAD_PARAMETERS, Refused(slash)},
        {"queue: cut path", queue, cutQueue.c_str(), false, 64, nullptr, ERR_BAD_PARAMETERS,
         Refused("sizeof(szPath) > snprintf(szPath, sizeof(szPath), \"/tmp/usbip_%s\", szPrinterId)")},
        {"queue: no status file", queue, kPrinter, false, 64, nullptr, 0, {queueGetFailed}},
        {"queue: no QUEUE key", queue, kPrinter, false, 64, "LOCK=\"Free\"\n", 0, {queueGetFailed}},
        {"lock: null ID", lock, nullptr, false, 64, nullptr, ERR_BAD_PARAMETERS, {}},
        {"lock: null buffer", lock, kPrinter, true, 64, nullptr, ERR_BAD_PARAMETERS, {}},
        {"lock: no room", lock, kPrinter, false, 0, nullptr, ERR_BAD_PARAMETERS, {}},
        {"lock: slash", lock, "dir/x", false, 64, nullptr, ERR_BAD_PARAMETERS, {}},
        // The lock status path has 4096 bytes: 4085 characters of ID are one too many.
        {"lock: cut path", lock, cutLock.c_str(), false, 64, nullptr, ERR_BAD_PARAMETERS, {}},
    };
    for (const FailedRead &c : cases) {
        SCOPED_TRACE(c.szName);
        if (c.szStatusFile) PlaceStatus(kPrinter, c.szStatusFile);
        ORLICErrSetEx(0, "test", 0);
        std::string buf(64, 'x');
        EXPECT_EQ(c.reader(c.szId, c.bNullBuf ? nullptr : buf.data(), c.cbBuf), -1);
        if (c.uError != 0) {
            EXPECT_EQ(ORLICErrGet(), c.uError);
        }
        EXPECT_EQ(buf, std::string(64, 'x'));
        EXPECT_EQ(Logs(), c.logs);
    }
    char szBuf[64];
    ASSERT_EQ(XAVOPrinterQueueGet(fitsQueue.c_str(), szBuf, sizeof szBuf), 0);
    EXPECT_STREQ(szBuf, "other printer");
}

}  // namespace
