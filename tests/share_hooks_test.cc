// The USB/IP sharing hooks: the lock status and queue text read from the sharing
// service's status file, and the driver binding tool's argument vectors.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

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
    } cases[] = {{nullptr, szBuf, 16, "((void *)0) != szPrinterId"}, {"", szBuf, 16, "0 != szPrinterId[0]"},
                 {kPrinter, nullptr, 16, "((void *)0) != szBuf"}, {kPrinter, szBuf, 0, "0 < cbBuf"}};
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

// The status file's path is built from the printer ID: one that holds "/"
// or would be cut to fit the path's buffer is refused, never read.  A cut
// queue-text path (256 bytes) would read another printer's file.
TEST(StatusArguments, PrinterIdThatLeavesTheDirectoryOrIsCutIsRefused) {
    const std::string fitsQueue(244, 'q');  // "/tmp/usbip_" + 244: 255 characters, fits 256 bytes
    // Written in place: the name leaves no room for a temporary file's suffix.
    std::FILE *other = std::fopen(("/tmp/usbip_" + fitsQueue).c_str(), "w");
    ASSERT_NE(other, nullptr);
    std::fputs("QUEUE=\"other printer\"\n", other);
    std::fclose(other);
    xavo::test::PlaceFile("/tmp/usbip_dir/x", "QUEUE=\"elsewhere\"\nLOCK=\"Locked\"\n");
    const std::string condSlash = "((void *)0) == strchr(szPrinterId, '/')";
    const std::string condFits = "sizeof(szPath) > snprintf(szPath, sizeof(szPath), \"/tmp/usbip_%s\", szPrinterId)";
    struct { std::string id; std::string condition; } const queueCases[] = {
        {"dir/x", condSlash}, {"../tmp/usbip_dir/x", condSlash}, {fitsQueue + "q", condFits}};
    char szBuf[64];
    for (const auto &c : queueCases) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterQueueGet(c.id.c_str(), szBuf, sizeof szBuf), -1) << c.id;
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        EXPECT_THAT(Logs(), ElementsAre("3 printer_queue_get:N Invaild Argument (" + c.condition + ")=[0]\n"));
    }
    ASSERT_EQ(XAVOPrinterQueueGet(fitsQueue.c_str(), szBuf, sizeof szBuf), 0);
    EXPECT_STREQ(szBuf, "other printer");
    // The lock status path has 4096 bytes: 4085 characters of ID are one too many.
    const std::string lockCases[] = {"dir/x", "../tmp/usbip_dir/x", std::string(4085, 'l')};
    for (const auto &id : lockCases) {
        ORLICErrSetEx(0, "test", 0);
        std::string buf(64, 'x');
        EXPECT_EQ(XAVOPrinterUsbipGetLockStatus(id.c_str(), buf.data(), 64), -1) << id.substr(0, 20);
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        EXPECT_EQ(buf, std::string(64, 'x'));
    }
    std::string buf(64, 'x');
    EXPECT_EQ(XAVOPrinterUsbipGetLockStatus(std::string(4084, 'l').c_str(), buf.data(), 64), 0);
    EXPECT_STREQ(buf.c_str(), "Free");
    EXPECT_THAT(Logs(), IsEmpty());
}

}  // namespace
