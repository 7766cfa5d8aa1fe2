// The usblp devices: opening with a bounded wait while busy, the device ID
// request and the soft reset.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <string>
#include <vector>

#include "support/logs.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using namespace xavo::test;

namespace {

std::vector<std::uint64_t> Seconds(int n) { return std::vector<std::uint64_t>(n, 1000000); }

TEST(UsblpOpen, NamesBecomePathsUnderDevUsbAndAnAbsentDeviceFailsAtOnce) {
    for (const char *name : {"lp0", "lp1"}) SetUsblp(name, {});
    for (auto [name, node] : {std::pair{"lp0", "lp0"}, std::pair{"/dev/usb/lp1", "lp1"}}) {
        int fd = XAVOPrinterDevOpen(name, 0);
        EXPECT_GE(fd, 0) << name;
        EXPECT_EQ(GetUsblp(node).openNow, 1) << name;
        close(fd);
    }
    EXPECT_EQ(XAVOPrinterDevOpen("dev/lp0", 8), -1);  // "/dev/usb/dev/lp0"
    EXPECT_EQ(GetUsblp("lp0").opens, 1);
    EXPECT_EQ(XAVOPrinterDevOpen(nullptr, 3), -1);
    char szBuf[16] = "untouched";
    EXPECT_EQ(XAVOPrinterGetStringId("lp2", szBuf, sizeof szBuf), -1);
    EXPECT_STREQ(szBuf, "untouched");
    EXPECT_EQ(XAVOResetPrinter("lp2"), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_device_open:N bad parameter.",
                                    "7 printer_get_string_id:N open device [lp2] error:(2) No such file or directory",
                                    "3 printer_reset_printer:N open device [lp2] error:(2) No such file or directory"));
    EXPECT_TRUE(TakeSleeps().empty());
}

TEST(UsblpOpen, BusyDeviceIsRetriedOncePerSecondUpToTheLimit) {
    const std::string busy = "7 printer_device_open:N lp0 device busy, retring...";
    const std::string gaveUp = "3 printer_device_open:N lp0 device open fail reach max, abort.";
    struct {
        int busyOpens, nRetry;
        bool opened;
    } cases[] = {{3, 8, true}, {8, 8, true}, {9, 8, false}, {1, 0, false}, {0, 0, true}};
    for (const auto &c : cases) {
        ResetSandbox();
        SetUsblp("lp0", {.busyOpens = c.busyOpens});
        int fd = XAVOPrinterDevOpen("lp0", c.nRetry);
        const int waits = std::min(c.busyOpens, c.nRetry);
        std::vector<std::string> expected(waits, busy);
        if (!c.opened) expected.push_back(gaveUp);
        EXPECT_EQ(fd >= 0, c.opened) << c.busyOpens << " busy, " << c.nRetry << " retries";
        EXPECT_EQ(GetUsblp("lp0").opens, waits + 1);
        EXPECT_EQ(Logs(), expected);
        EXPECT_EQ(TakeSleeps(), Seconds(waits));
        if (fd >= 0) close(fd);
    }
}

TEST(UsblpDeviceId, RefusedRequestsAreRetriedEightTimesASecondApart) {
    const std::string retry = "3 printer_get_string_id:N ioctl LPIOC_GET_DEVICE_ID error:(5) Input/output error";
    for (int failures : {0, 3, 8, 12}) {
        ResetSandbox();
        SetUsblp("lp0", {.deviceIdFailures = failures, .deviceIdReply = UsblpReply("MFG:ACME;")});
        char szBuf[64] = {};
        const int attempts = std::min(failures, 8);
        EXPECT_EQ(XAVOPrinterGetStringId("lp0", szBuf, sizeof szBuf), failures < 8 ? 0 : -1);
        EXPECT_STREQ(szBuf, failures < 8 ? "MFG:ACME;" : "");
        std::vector<std::string> expected;
        for (int i = 0; i < attempts; ++i) expected.push_back(retry + ", retry: " + std::to_string(i));
        if (failures >= 8) expected.push_back(retry);
        EXPECT_EQ(Logs(), expected) << failures << " refusals";
        EXPECT_EQ(TakeSleeps(), Seconds(attempts));
        EXPECT_EQ(GetUsblp("lp0").requests, std::vector<std::uint32_t>(std::min(failures + 1, 8), 0x8FFF5001));
        EXPECT_EQ(GetUsblp("lp0").openNow, 0);
    }
}

TEST(UsblpDeviceId, ReplyIsCutToTheCallersBufferAndAnswersTheStatedLength) {
    auto raw = [](int hi, int lo, const std::string &text) { return std::string{char(hi), char(lo)} + text; };
    struct {
        std::string reply;
        int32_t cbBuf, result;
        std::string text;
    } cases[] = {
        {UsblpReply("MFG:A;"), 64, 0, "MFG:A;"},
        {raw(0x01, 0x80, "MFG:A;"), 64, 384, "MFG:A;"},  // big-endian length
        {raw(0x01, 0x2c, std::string(300, 'x')), 100, 300, std::string(99, 'x')},
        {raw(0x00, 0x64, std::string(300, 'x')), 100, 0, std::string(99, 'x')},
        {raw(0xff, 0xff, "MDL:X;"), 64, 65535, "MDL:X;"},  // states more than came
        // Fills the driver's whole buffer with no NUL in it.
        {raw(0x10, 0x00, std::string(5000, 'y')), 8192, 0, std::string(4093, 'y')},
        {UsblpReply("MFG:A;"), 1, 8, ""},
    };
    for (const auto &c : cases) {
        SetUsblp("lp0", {.deviceIdReply = c.reply});
        // Guard bytes behind the caller's buffer show any write past it.
        std::vector<char> buf(static_cast<size_t>(c.cbBuf) + 16, '#');
        EXPECT_EQ(XAVOPrinterGetStringId("lp0", buf.data(), c.cbBuf), c.result) << c.cbBuf;
        EXPECT_EQ(std::string(buf.data()), c.text);
        EXPECT_EQ(std::string(buf.end() - 16, buf.end()), std::string(16, '#'));
    }
    EXPECT_TRUE(Logs().empty());
}

TEST(UsblpReset, AcceptedOrRefusedAndTheDeviceIsClosed) {
    SetUsblp("lp0", {});
    EXPECT_EQ(XAVOResetPrinter("lp0"), 0);
    SetUsblp("lp0", {.resetAccepted = false});
    EXPECT_EQ(XAVOResetPrinter("lp0"), -1);
    EXPECT_EQ(GetUsblp("lp0").requests, (std::vector<std::uint32_t>{0x5009, 0x5009}));
    EXPECT_EQ(GetUsblp("lp0").openNow, 0);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_reset_printer:N ioctl LPIOC_SOFT_RESET error:(5) Input/output error"));
}

}  // namespace
