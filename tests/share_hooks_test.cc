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

using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::Eq;
using ::testing::IsEmpty;
using ::testing::Matcher;
using xavo::test::Logs;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";

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

// The service's status file for a printer ID, written in place (the
// longest IDs leave no room for a temporary file's suffix); "" removes it.
void PlaceStatus(const std::string &id, const std::string &content) {
    const std::string path = "/tmp/usbip_" + id;
    std::remove(path.c_str());
    if (content.empty()) return;
    std::FILE *file = std::fopen(path.c_str(), "w");
    ASSERT_NE(file, nullptr) << path;
    std::fputs(content.c_str(), file);
    std::fclose(file);
}

std::string Queue(const std::string &text) { return "LOCK=\"Free\"\nQUEUE=\"" + text + "\"\n"; }

std::vector<std::string> Refused(const std::string &condition) {
    return {"3 printer_queue_get:N Invaild Argument (" + condition + ")=[0]\n"};
}

// A call of one of the two status readers with a 64-byte buffer of 'x':
// its result, the buffer up to its first NUL afterwards, and its lines.
struct StatusRead {
    const char *szName;
    int32_t (*reader)(const char *, char *, int32_t);
    const char *szId;
    std::string status;  // the ID's status file; "": none
    bool bNullBuf;
    int32_t cbBuf;
    int32_t iResult;
    std::string shown;
    std::uint32_t uError;  // 0: not checked
    Matcher<std::vector<std::string>> logs;
};

// The lock status answers the service's text or "Free" and logs nothing;
// the queue text rewrites the first remark to name the CUPS jobs.  The
// status file's path is built from the printer ID: one that holds "/" or
// would be cut to fit the path's buffer is refused, never read (a cut
// queue-text path, 256 bytes, would read another printer's file).  The
// queue text logs the failed condition; the lock status logs nothing and
// takes an empty printer ID, which reads the bare prefix.  A failed call
// leaves the buffer alone.
TEST(StatusReaders, AnswerTheServicesTextsAndRefuseIdsThatLeaveTheirFile) {
    const std::string fitsQueue(244, 'q');  // "/tmp/usbip_" + 244: 255 characters, fits 256 bytes
    const std::string longestLock(4084, 'l'), cutQueue = fitsQueue + "q", cutLock = longestLock + "l";
    xavo::test::PlaceFile("/tmp/usbip_dir/x", "QUEUE=\"elsewhere\"\nLOCK=\"Locked\"\n");
    const std::string x(64, 'x'), slash = "((void *)0) == strchr(szPrinterId, '/')";
    const std::string refine = "3 printer_queue_get:N cannot refine printer queue name";
    const std::string queueGetFailed = std::string("3 printer_queue_get:N get queue failed, printer=") + kPrinter;
    const auto queue = XAVOPrinterQueueGet;
    const auto lock = XAVOPrinterUsbipGetLockStatus;
    const StatusRead cases[] = {
        {"lock: no file", lock, kPrinter, "", false, 64, 0, "Free", 0, IsEmpty()},
        {"lock: no file, small buffer", lock, kPrinter, "", false, 3, 0, "Fr", 0, IsEmpty()},
        {"lock: locked", lock, kPrinter, "QUEUE=\"q (x)\"\nLOCK=\"Locked by 10.0.0.7\"\n", false, 64, 0,
         "Locked by 10.0.0.7", 0, IsEmpty()},
        {"lock: no LOCK key", lock, kPrinter, "QUEUE=\"q (x)\"\n", false, 64, 0, "Free", 0, IsEmpty()},
        {"lock: empty ID", lock, "", "LOCK=\"Busy\"\n", false, 64, 0, "Busy", 0, IsEmpty()},
        {"lock: longest ID", lock, longestLock.c_str(), "", false, 64, 0, "Free", 0, IsEmpty()},
        {"queue: no remark", queue, kPrinter, Queue("Printer queue"), false, 64, 0, "Printer queue", 0, IsEmpty()},
        {"queue: remark", queue, kPrinter, Queue("Ready (3 jobs)"), false, 64, 0, "Ready (CUPS Jobs)", 0, IsEmpty()},
        // A long remark keeps its tail.
        {"queue: long remark", queue, kPrinter, Queue("Ready (waiting for host)"), false, 64, 0,
         "Ready (CUPS Jobsg for host)", 0, IsEmpty()},
        {"queue: empty remark", queue, kPrinter, Queue("Queue () end"), false, 64, 0, "Queue (CUPS Jobs) end", 0,
         IsEmpty()},
        {"queue: two remarks", queue, kPrinter, Queue("A (bc) D (ef)"), false, 64, 0, "A (CUPS Jobs) D (ef)", 0,
         IsEmpty()},
        {"queue: unclosed remark", queue, kPrinter, Queue("Jobs (usbip"), false, 64, 0, "Jobs (usbip", 0,
         ElementsAre(refine)},
        // Too small for the rewrite: may fall back to the raw value, with the same line.
        {"queue: one byte", queue, kPrinter, Queue("Ready (3 jobs)"), false, 1, 0, "", 0, Each(Eq(refine))},
        {"queue: longest ID", queue, fitsQueue.c_str(), "QUEUE=\"other printer\"\n", false, 64, 0, "other printer", 0,
         IsEmpty()},
        {"queue: null ID", queue, nullptr, "", false, 64, -1, x, ERR_BAD_PARAMETERS,
         Refused("((void *)0) != szPrinterId")},
        {"queue: empty ID", queue, "", "", false, 64, -1, x, ERR_BAD_PARAMETERS, Refused("0 != szPrinterId[0]")},
        {"queue: null buffer", queue, kPrinter, "", true, 64, -1, x, ERR_BAD_PARAMETERS,
         Refused("((void *)0) != szBuf")},
        {"queue: no room", queue, kPrinter, "", false, 0, -1, x, ERR_BAD_PARAMETERS, Refused("0 < cbBuf")},
        {"queue: slash", queue, "dir/x", "", false, 64, -1, x, ERR_BAD_PARAMETERS, Refused(slash)},
        // Cut, its path would name the longest ID's file, placed above.
        {"queue: cut path", queue, cutQueue.c_str(), "", false, 64, -1, x, ERR_BAD_PARAMETERS,
         Refused("sizeof(szPath) > snprintf(szPath, sizeof(szPath), \"/tmp/usbip_%s\", szPrinterId)")},
        {"queue: no status file", queue, kPrinter, "", false, 64, -1, x, 0, ElementsAre(queueGetFailed)},
        {"queue: no QUEUE key", queue, kPrinter, "LOCK=\"Free\"\n", false, 64, -1, x, 0, ElementsAre(queueGetFailed)},
        {"lock: null ID", lock, nullptr, "", false, 64, -1, x, ERR_BAD_PARAMETERS, IsEmpty()},
        {"lock: null buffer", lock, kPrinter, "", true, 64, -1, x, ERR_BAD_PARAMETERS, IsEmpty()},
        {"lock: no room", lock, kPrinter, "", false, 0, -1, x, ERR_BAD_PARAMETERS, IsEmpty()},
        {"lock: slash", lock, "dir/x", "", false, 64, -1, x, ERR_BAD_PARAMETERS, IsEmpty()},
        // The lock status path has 4096 bytes: 4085 characters of ID are one too many.
        {"lock: cut path", lock, cutLock.c_str(), "", false, 64, -1, x, ERR_BAD_PARAMETERS, IsEmpty()},
    };
    for (const StatusRead &c : cases) {
        SCOPED_TRACE(c.szName);
        if (c.szId != nullptr) PlaceStatus(c.szId, c.status);
        ORLICErrSetEx(0, "test", 0);
        std::string buf = x;
        EXPECT_EQ(c.reader(c.szId, c.bNullBuf ? nullptr : buf.data(), c.cbBuf), c.iResult);
        EXPECT_EQ(std::string(buf.c_str()), c.shown);
        if (c.uError != 0) {
            EXPECT_EQ(ORLICErrGet(), c.uError);
        }
        EXPECT_THAT(Logs(), c.logs);
    }
}

}  // namespace
