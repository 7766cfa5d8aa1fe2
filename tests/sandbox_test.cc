// The sandbox every suite runs in, for what every suite's results rest on: nothing reaches the host, layers are
// fresh between tests, logs and sleeps are caught from children too, the simulated usblp devices answer real
// open()/ioctl() calls (through the preload shim as well), and nothing outlives the run.  Device and sleep calls go
// through xavo_sandbox_probe, a shared object built apart, so they reach the interposers as the library's calls do.
#include <fcntl.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"
#include "support/logs.h"
#include "support/processes.h"

extern "C" {
int XavoProbeOpen(const char *path, int flags);
int XavoProbeOpenMode(const char *path, int flags, mode_t mode);
int XavoProbeOpenAt(const char *path, int flags);
int XavoProbeIoctl(int fd, unsigned long request, void *arg);
unsigned int XavoProbeSleep(unsigned int seconds);
int XavoProbeUsleep(unsigned int usec);
}

namespace {

namespace xt = xavo::test;
using namespace std::chrono_literals;

constexpr unsigned long kDeviceId = 0x8FFF5001;

// The exit code of a shell command.
int Shell(const std::string &command) {
    const int status = std::system(command.c_str());
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// errno of a failed call, 0 for a success.
int ErrnoOf(int rc) { return rc >= 0 ? 0 : errno; }

TEST(SandboxIsolation, WritesNeverReachTheHost) {
    ASSERT_TRUE(xt::FileExists(xt::HostPath("/etc/samba/smb.conf")));
    // A fresh sandbox links /usr/bin/lpadmin to Debian's /usr/sbin one:
    // a fake put in its place must leave the real one for the real cupsd.
    const std::string realLpadmin = xt::ReadFile("/usr/sbin/lpadmin");
    const std::vector<std::string> paths = {
        "/usr/xavo/etc/printer.conf", "/tmp/usbtab",           "/etc/samba/smb.reserved.conf",
        "/etc/cups/printers.conf",    "/etc/samba/smb.conf",   "/var/services/printer/job1",
        "/run/xavosdk/lock/lock_printer", "/root/.xavo-probe", "/usr/bin/lpadmin"};
    for (const std::string &path : paths) {
        const std::string host = xt::HostPath(path);
        const std::string hostText = xt::ReadFile(host);
        xt::PlaceFile(path, "written inside\n");
        EXPECT_EQ(xt::ReadFile(path), "written inside\n") << path;
        EXPECT_EQ(xt::ReadFile(host), hostText) << path;
    }
    EXPECT_EQ(xt::ReadFile("/usr/sbin/lpadmin"), realLpadmin);
}

TEST(SandboxIsolation, NetworkIsLoopbackOnlyAndAnswersPing) {
    // /proc/net/dev: two header lines, then one line per interface.
    const std::string devices = xt::ReadFile("/proc/net/dev");
    EXPECT_EQ(std::count(devices.begin(), devices.end(), '\n'), 3) << devices;
    EXPECT_NE(devices.find("lo:"), std::string::npos);
    EXPECT_EQ(Shell("/bin/ping -c 1 -W 2 127.0.0.1 >/dev/null"), 0);
}

TEST(SandboxReset, DropsWhatTheTestLeft) {
    const std::vector<std::string> files = {"/usr/bin/xavo-left", "/etc/xavo-left", "/var/lib/xavo-left",
                                            "/tmp/xavo-left", "/run/xavo-left", "/root/xavo-left"};
    for (const std::string &f : files) xt::PlaceFile(f, "x");
    ASSERT_EQ(unlink("/etc/passwd"), 0);
    xt::SetUsblp("lp0", {});
    xt::PlugUsbDevice({});
    syslog(LOG_ERR, "left:1 behind");
    XavoProbeUsleep(10);
    xt::SetRealSleep(true);
    xt::ResetSandbox();
    for (const std::string &f : files) EXPECT_FALSE(xt::FileExists(f)) << f;
    EXPECT_EQ(xt::ReadFile("/etc/passwd"), xt::ReadFile(xt::HostPath("/etc/passwd")));
    EXPECT_TRUE(xt::FileExists("/run/xavosdk/lock"));
    EXPECT_TRUE(xt::TakeLogs().empty());
    EXPECT_TRUE(xt::TakeSleeps().empty());
    EXPECT_EQ(ErrnoOf(XavoProbeOpen("/dev/usb/lp0", O_RDONLY)), ENOENT);
    EXPECT_FALSE(xt::FileExists("/sys/class/usbmisc/lp0"));
    const auto start = std::chrono::steady_clock::now();
    XavoProbeSleep(5);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 1s) << "real sleeps stayed on";
}

// Two tests per suite; whichever runs second looks for the first's file.
int g_isolatedRuns = 0, g_sharedRuns = 0;
void MarkAndLook(int &runs, const std::string &mine, const std::string &other, bool shared) {
    xt::PlaceFile("/usr/xavo/etc/" + mine, mine);
    EXPECT_TRUE(++runs < 2 || xt::FileExists("/usr/xavo/etc/" + other) == shared) << other;
}

TEST(SandboxPerTest, FirstTestWrites) { MarkAndLook(g_isolatedRuns, "a", "b", false); }
TEST(SandboxPerTest, SecondTestSeesNothingOfIt) { MarkAndLook(g_isolatedRuns, "b", "a", false); }

XAVO_SANDBOX_PER_SUITE(SandboxPerSuite);
TEST(SandboxPerSuite, FirstTestWrites) { MarkAndLook(g_sharedRuns, "a", "b", true); }
TEST(SandboxPerSuite, SecondTestSeesIt) { MarkAndLook(g_sharedRuns, "b", "a", true); }

// Exact log lines are pinned by every suite; here that a forked child's
// lines and sleeps join its test's.
TEST(CountedSleeps, ReturnAtOnceIntoOneListWithForkedChildrenAndWaitOnlyInRealMode) {
    const auto start = std::chrono::steady_clock::now();
    for (int i = 0; i < 100; ++i) ASSERT_EQ(XavoProbeUsleep(50000), 0);
    ASSERT_TRUE(xt::InChild([] {
        syslog(LOG_DEBUG, "child:2 lp0 device busy, retring...");
        return XavoProbeSleep(8) == 0 && XavoProbeUsleep(3) == 0;
    }));
    EXPECT_EQ(xt::Logs(), std::vector<std::string>{"7 child:N lp0 device busy, retring..."});
    EXPECT_LT(std::chrono::steady_clock::now() - start, 2s);
    std::vector<std::uint64_t> expected(100, 50000);
    expected.insert(expected.end(), {8000000, 3});
    EXPECT_EQ(xt::TakeSleeps(), expected);
    xt::SetRealSleep(true);
    const auto real = std::chrono::steady_clock::now();
    EXPECT_EQ(XavoProbeUsleep(60000), 0);
    EXPECT_GE(std::chrono::steady_clock::now() - real, 60ms);
    EXPECT_EQ(xt::TakeSleeps(), (std::vector<std::uint64_t>{60000}));
}

// Every entry point the library's compiler may pick answers alike: __open_2, open() with a mode, fortified openat().
TEST(SimulatedUsblp, EveryOpenEntryPointAnswersAsConfigured) {
    const std::vector<std::pair<std::function<int()>, int>> entries = {
        {[] { return XavoProbeOpen("/dev/usb/lp1", O_RDONLY); }, O_RDONLY},
        {[] { return XavoProbeOpenMode("/dev/usb/lp1", O_RDWR | O_CREAT, 0600); }, O_RDWR | O_CREAT},
        {[] { return XavoProbeOpenAt("/dev/usb/lp1", O_RDONLY | O_NONBLOCK); }, O_RDONLY | O_NONBLOCK},
    };
    for (const auto &[open, flags] : entries) {
        SCOPED_TRACE(flags);
        xt::SetUsblp("lp1", {.busyOpens = 1});
        const int opensBefore = xt::GetUsblp("lp1").opens;
        EXPECT_EQ(ErrnoOf(open()), EBUSY);
        const int fd = open();
        EXPECT_GE(fd, 0);
        if (fd >= 0) close(fd);
        EXPECT_EQ(xt::GetUsblp("lp1").opens, opensBefore + 2);
        EXPECT_EQ(xt::GetUsblp("lp1").lastOpenFlags, flags);
    }
    // O_CREAT on an absent device creates nothing.
    xt::SetUsblp("lp1", {.present = false});
    EXPECT_EQ(ErrnoOf(XavoProbeOpenMode("/dev/usb/lp1", O_RDWR | O_CREAT, 0600)), ENOENT);
    EXPECT_FALSE(xt::FileExists("/dev/usb/lp1"));
}

// The device ID, reset and enable answers are pinned by the usblp device and plug-in tests; here what those cannot
// reach: an unknown request, and a device unplugged under an open descriptor.
TEST(SimulatedUsblp, RequestsAnswerAsTheDriverDoes) {
    xt::SetUsblp("lp0", {});
    const int fd = XavoProbeOpen("/dev/usb/lp0", O_RDONLY);
    ASSERT_GE(fd, 0);
    std::vector<char> buf(64, 0);
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, TCGETS, buf.data())), ENOTTY);
    xt::SetUsblp("lp0", {.present = false});
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, kDeviceId, buf.data())), ENODEV);
    EXPECT_EQ(xt::GetUsblp("lp0").requests, (std::vector<std::uint32_t>{TCGETS, kDeviceId}));
    close(fd);
    EXPECT_EQ(xt::GetUsblp("lp0").openNow, 0);
}

#ifdef XAVO_USBLP_PRELOAD
TEST(SimulatedUsblp, PreloadedShimServesExecutedPrograms) {
    xt::SetUsblp("lp0", {.busyOpens = 1});
    // The shell's own open() of a redirection: busy first, then opened.
    // Quoted: the path holds ld.so's own "$LIB", not the shell's.
    const std::string shell = std::string("LD_PRELOAD='") + XAVO_USBLP_PRELOAD +
                              "' /bin/sh -c 'cat </dev/usb/lp0 || cat </dev/usb/lp0' 2>/dev/null";
    EXPECT_EQ(Shell(shell), 0);
    EXPECT_EQ(xt::GetUsblp("lp0").opens, 2);
}
#endif

TEST(SandboxLeftovers, EveryProcessStartedInsideIsStoppedAtTheEnd) {
    // A daemon's way: the shell exits and its children, orphaned, are ours;
    // the sandbox names them on stderr as it stops them.
    ASSERT_EQ(Shell("/bin/sh -c '/bin/sleep 60 >/dev/null 2>&1 & /bin/sleep 60 >/dev/null 2>&1 &'"), 0);
    ASSERT_EQ(xt::Descendants().size(), 2u);
    xt::detail::StopLeftovers();
    EXPECT_TRUE(xt::Descendants().empty());
}

}  // namespace
