// The sandbox every suite runs in: isolation from the host, renewal between
// tests, syslog capture, counted sleeps, the simulated usblp devices and the
// fake sysfs.  Device and sleep calls go through xavo_sandbox_probe, a
// shared object built apart, so they reach the interposers the way the
// library's calls do.
#include <fcntl.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

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
constexpr unsigned long kSoftReset = 0x5009;
constexpr unsigned long kEnable = 0x40005008;
constexpr unsigned long kDisable = 0x40005007;

// Runs body in a forked child and gives its exit code; a child still
// running after the limit is killed and gives -1.
int InChild(const std::function<int()> &body, std::chrono::seconds limit = 60s) {
    const pid_t pid = fork();
    if (pid == 0) _exit(body());
    const auto deadline = std::chrono::steady_clock::now() + limit;
    int status = 0;
    while (waitpid(pid, &status, WNOHANG) == 0) {
        if (std::chrono::steady_clock::now() > deadline) {
            kill(pid, SIGKILL);
            waitpid(pid, &status, 0);
            return -1;
        }
        std::this_thread::sleep_for(5ms);
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

struct Ran {
    int status;
    std::string output;
};
Ran RunCommand(const std::string &command) {
    FILE *p = popen((command + " 2>&1").c_str(), "r");
    if (p == nullptr) return {-1, ""};
    std::string out;
    char buf[4096];
    for (size_t n; (n = fread(buf, 1, sizeof buf, p)) > 0;) out.append(buf, n);
    const int status = pclose(p);
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, out};
}

// errno of a failed call, 0 for a success.
int ErrnoOf(int rc) { return rc >= 0 ? 0 : errno; }

// ---- isolation ----------------------------------------------------------------

TEST(SandboxIsolation, WritesNeverReachTheHost) {
    ASSERT_TRUE(xt::FileExists(xt::HostPath("/etc/samba/smb.conf")));
    const std::vector<std::string> paths = {
        "/usr/xavo/etc/printer.conf", "/tmp/usbtab",           "/etc/samba/smb.reserved.conf",
        "/etc/cups/printers.conf",    "/etc/samba/smb.conf",   "/var/services/printer/job1",
        "/run/xavosdk/lock/lock_printer", "/root/.xavo-probe", "/usr/bin/lpadmin"};
    for (const std::string &path : paths) {
        SCOPED_TRACE(path);
        const std::string host = xt::HostPath(path);
        const bool hostHad = xt::FileExists(host);
        const std::string hostText = xt::ReadFile(host);
        xt::PlaceFile(path, "written inside\n");
        EXPECT_EQ(xt::ReadFile(path), "written inside\n");
        EXPECT_EQ(xt::FileExists(host), hostHad);
        EXPECT_EQ(xt::ReadFile(host), hostText);
    }
}

TEST(SandboxIsolation, NetworkIsLoopbackOnlyAndAnswersPing) {
    const std::string devices = xt::ReadFile("/proc/net/dev");
    int interfaces = 0;
    for (size_t at = devices.find(':'); at != std::string::npos; at = devices.find(':', at + 1)) ++interfaces;
    EXPECT_EQ(interfaces, 1) << devices;
    EXPECT_NE(devices.find("lo:"), std::string::npos);
    const Ran ping = RunCommand("/bin/ping -c 1 -W 2 127.0.0.1");
    EXPECT_EQ(ping.status, 0) << ping.output;
}

TEST(SandboxIsolation, PlacedProgramReplacesTheLinkNotItsTarget) {
    // A fresh sandbox links /usr/bin/lpadmin to Debian's /usr/sbin one.
    const std::string real = xt::ReadFile("/usr/sbin/lpadmin");
    xt::PlaceProgram("/usr/bin/lpadmin", "#!/bin/sh\necho \"fake lpadmin $*\"\nexit 3\n");
    const Ran ran = RunCommand("/usr/bin/lpadmin -x usbprinter1");
    EXPECT_EQ(ran.status, 3);
    EXPECT_EQ(ran.output, "fake lpadmin -x usbprinter1\n");
    EXPECT_EQ(xt::ReadFile("/usr/sbin/lpadmin"), real);
}

// ---- renewal --------------------------------------------------------------------

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
    EXPECT_NE(xt::ReadFile("/etc/passwd"), "");
    EXPECT_TRUE(xt::FileExists("/run/xavosdk/lock"));
    EXPECT_TRUE(xt::TakeLogs().empty());
    EXPECT_TRUE(xt::TakeSleeps().empty());
    EXPECT_EQ(ErrnoOf(XavoProbeOpen("/dev/usb/lp0", O_RDONLY)), ENOENT);
    EXPECT_FALSE(xt::FileExists("/sys/class/usbmisc/lp0"));
    const auto start = std::chrono::steady_clock::now();
    XavoProbeSleep(5);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 1s) << "real sleeps stayed on";
    // The system's own programs still work on the new layers.
    xt::PlaceFile("/etc/samba/smb.conf", "[global]\n   workgroup = XAVO\n");
    const Ran testparm = RunCommand("/usr/bin/testparm -s --parameter-name=workgroup");
    EXPECT_EQ(testparm.status, 0) << testparm.output;
    EXPECT_NE(testparm.output.find("XAVO"), std::string::npos) << testparm.output;
}

// Two tests per suite; whichever runs second looks for the first's file.
int g_isolatedRuns = 0;
int g_sharedRuns = 0;
void MarkAndLook(int &runs, const std::string &mine, const std::string &other, bool shared) {
    xt::PlaceFile("/usr/xavo/etc/" + mine, mine);
    if (++runs == 2) {
        EXPECT_EQ(xt::FileExists("/usr/xavo/etc/" + other), shared);
    }
}

TEST(SandboxPerTest, FirstTestWrites) { MarkAndLook(g_isolatedRuns, "a", "b", false); }
TEST(SandboxPerTest, SecondTestSeesNothingOfIt) { MarkAndLook(g_isolatedRuns, "b", "a", false); }

XAVO_SANDBOX_PER_SUITE(SandboxPerSuite);
TEST(SandboxPerSuite, FirstTestWrites) { MarkAndLook(g_sharedRuns, "a", "b", true); }
TEST(SandboxPerSuite, SecondTestSeesIt) { MarkAndLook(g_sharedRuns, "b", "a", true); }

// ---- syslog ---------------------------------------------------------------------

TEST(SyslogCapture, GivesPriorityAndMessageAsSent) {
    struct Case {
        int priority;
        const char *text;
    };
    const std::vector<Case> cases = {
        {LOG_ERR, "x:1 msg"},
        {LOG_DEBUG, "printer_device_open:42 lp0 device busy, retring..."},
        {LOG_ERR, "unit:7 Invaild Argument (szName)=[0]\n"},
        {LOG_WARNING | LOG_DAEMON, "a: b: c"},
        {LOG_INFO, ""},
    };
    for (const Case &c : cases) syslog(c.priority, "%s", c.text);
    ASSERT_EQ(InChild([] {
                  syslog(LOG_ERR, "child:2 from the child");
                  return 0;
              }),
              0);
    const std::vector<xt::LogLine> logs = xt::TakeLogs();
    ASSERT_EQ(logs.size(), cases.size() + 1);
    for (size_t i = 0; i < cases.size(); ++i) {
        EXPECT_EQ(logs[i].priority, cases[i].priority & 7) << i;
        EXPECT_EQ(logs[i].message, cases[i].text) << i;
    }
    EXPECT_EQ(logs.back().priority, LOG_ERR);
    EXPECT_EQ(logs.back().message, "child:2 from the child");
    EXPECT_TRUE(xt::TakeLogs().empty());
}

TEST(SyslogCapture, FloodFromAChildIsKeptWholeWithoutBlocking) {
    constexpr int kLines = 20000;
    ASSERT_EQ(InChild([] {
                  for (int i = 0; i < kLines; ++i) syslog(LOG_DEBUG, "flood:%d", i);
                  return 0;
              }),
              0);
    const std::vector<xt::LogLine> logs = xt::TakeLogs();
    ASSERT_EQ(logs.size(), static_cast<size_t>(kLines));
    for (int i = 0; i < kLines; ++i) {
        if (logs[i].message != "flood:" + std::to_string(i)) {
            ADD_FAILURE() << "line " << i << " is " << logs[i].message;
            break;
        }
    }
}

TEST(SyslogCapture, ParsesHeadersOfOtherSenders) {
    struct Case {
        const char *datagram;
        int priority;
        const char *message;
    };
    const std::vector<Case> cases = {
        {"<11>Nov 22 22:30:01 cupsd[812]: Unknown: directive\n", 3, "Unknown: directive\n"},
        {"<191>Jan  5 01:02:03 snmpd: Connection from UDP", 7, "Connection from UDP"},
        {"<14>no header at all", 6, "no header at all"},
        {"<30>Jan  5 01:02:03 ident-without-message", 6, "ident-without-message"},
        {"not syslog: at all", -1, "not syslog: at all"},
        {"<1x>Jan  5 01:02:03 a: b", -1, "<1x>Jan  5 01:02:03 a: b"},
    };
    for (const Case &c : cases) {
        const xt::LogLine line = xt::detail::ParseSyslogDatagram(c.datagram);
        EXPECT_EQ(line.priority, c.priority) << c.datagram;
        EXPECT_EQ(line.message, c.message) << c.datagram;
    }
}

// ---- sleeps ---------------------------------------------------------------------

TEST(CountedSleeps, ReturnAtOnceIntoOneListWithForkedChildrenAndWaitOnlyInRealMode) {
    const auto start = std::chrono::steady_clock::now();
    for (int i = 0; i < 100; ++i) ASSERT_EQ(XavoProbeUsleep(50000), 0);
    ASSERT_EQ(InChild([] { return XavoProbeSleep(8) == 0 && XavoProbeUsleep(3) == 0 ? 0 : 1; }), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, 2s);
    std::vector<std::uint64_t> expected(100, 50000);
    expected.insert(expected.end(), {8000000, 3});
    EXPECT_EQ(xt::TakeSleeps(), expected);
    EXPECT_TRUE(xt::TakeSleeps().empty());

    xt::SetRealSleep(true);
    const auto real = std::chrono::steady_clock::now();
    EXPECT_EQ(XavoProbeUsleep(60000), 0);
    EXPECT_GE(std::chrono::steady_clock::now() - real, 60ms);
    EXPECT_EQ(xt::TakeSleeps(), (std::vector<std::uint64_t>{60000}));
}

// ---- usblp ----------------------------------------------------------------------

// Absent, busy and never-configured devices are pinned through the usblp
// device tests and the reset test; here every entry point the library's
// compiler may pick answers alike: fortified open() (__open_2), open()
// with a mode, fortified openat() (__openat_2).
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
        const xt::UsblpSeen seen = xt::GetUsblp("lp1");
        EXPECT_EQ(seen.opens, opensBefore + 2);
        EXPECT_EQ(seen.lastOpenFlags, flags);
        EXPECT_EQ(seen.openNow, 0);
    }
    // O_CREAT on an absent device creates nothing.
    xt::SetUsblp("lp1", {.present = false});
    EXPECT_EQ(ErrnoOf(XavoProbeOpenMode("/dev/usb/lp1", O_RDWR | O_CREAT, 0600)), ENOENT);
    EXPECT_FALSE(xt::FileExists("/dev/usb/lp1"));
}

// The device ID and reset answers are pinned by the usblp device tests;
// here what those cannot reach: other requests, and a device unplugged
// under an open descriptor.
TEST(SimulatedUsblp, RequestsAnswerAsTheDriverDoes) {
    xt::SetUsblp("lp0", {.deviceIdReply = xt::UsblpReply("MFG:ACME;")});
    const int fd = XavoProbeOpen("/dev/usb/lp0", O_RDONLY);
    ASSERT_GE(fd, 0);
    EXPECT_EQ(xt::GetUsblp("lp0").openNow, 1);
    std::vector<char> buf(64, 0);
    int flag = 1;
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, kEnable, &flag)), 0);
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, kDisable, &flag)), 0);
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, TCGETS, buf.data())), ENOTTY);
    xt::SetUsblp("lp0", {.present = false});
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, kDeviceId, buf.data())), ENODEV);
    EXPECT_EQ(xt::GetUsblp("lp0").requests, (std::vector<std::uint32_t>{kEnable, kDisable, TCGETS, kDeviceId}));
    close(fd);
    EXPECT_EQ(xt::GetUsblp("lp0").openNow, 0);
}

TEST(SimulatedUsblp, OtherPathsAndDescriptorsReachTheSystem) {
    xt::SetUsblp("lp0", {});
    const int fd = XavoProbeOpen("/dev/null", O_RDONLY);
    ASSERT_GE(fd, 0);
    int pipes[2];
    ASSERT_EQ(pipe(pipes), 0);
    ASSERT_EQ(write(pipes[1], "abc", 3), 3);
    int queued = 0;
    EXPECT_EQ(XavoProbeIoctl(pipes[0], FIONREAD, &queued), 0);
    EXPECT_EQ(queued, 3);
    EXPECT_EQ(ErrnoOf(XavoProbeIoctl(fd, kSoftReset, nullptr)), ENOTTY);
    EXPECT_EQ(ErrnoOf(XavoProbeOpen("/dev/usb/dev/lp0", O_RDONLY)), ENOENT);
    close(fd);
    close(pipes[0]);
    close(pipes[1]);
    EXPECT_TRUE(xt::GetUsblp("lp0").requests.empty());
}

#ifdef XAVO_USBLP_PRELOAD
TEST(SimulatedUsblp, PreloadedShimServesExecutedPrograms) {
    xt::SetUsblp("lp0", {.busyOpens = 1});
    // The shell's own open() of a redirection: busy first, then opened.
    const std::string shell = std::string("LD_PRELOAD=") + XAVO_USBLP_PRELOAD +
                              " /bin/sh -c 'cat </dev/usb/lp0 || cat </dev/usb/lp0 && echo opened'";
    const Ran ran = RunCommand(shell);
    EXPECT_EQ(ran.status, 0) << ran.output;
    EXPECT_NE(ran.output.find("opened"), std::string::npos) << ran.output;
    EXPECT_EQ(xt::GetUsblp("lp0").opens, 2);
}
#endif

// ---- sysfs ----------------------------------------------------------------------

TEST(FakeSysfs, PlugShowsTheDeviceAndUnplugRemovesOnlyIt) {
    const std::string usb1 = "/sys/devices/pci0000:00/0000:00:14.0/usb1/";
    xt::PlugUsbDevice({});
    xt::PlugUsbDevice({.devName = "lp1", .busId = "1-2", .vendor = 0x03f0, .product = 0xab12, .serial = "",
                       .manufacturer = "HP", .productName = "LaserJet", .interfaceClass = 0xff});
    struct Expect {
        std::string path;
        std::string content;
    };
    // The attributes the USB stand-in reads through /sys/class/usbmisc are
    // pinned by its own tests; here the rest of the layout.
    const std::vector<Expect> files = {
        {usb1 + "1-1/idVendor", "04b8\n"},
        {"/sys/class/usbmisc/lp0/dev", "180:0\n"},
        {"/sys/class/usbmisc/lp0/device/bInterfaceClass", "07\n"},
        {"/sys/bus/usb/devices/1-1/idVendor", "04b8\n"},
        {"/sys/class/usbmisc/lp1/dev", "180:1\n"},
        {"/sys/bus/usb/devices/1-2/idProduct", "ab12\n"},
        {"/sys/bus/usb/devices/1-2:1.0/bInterfaceClass", "ff\n"},
    };
    for (const Expect &e : files) EXPECT_EQ(xt::ReadFile(e.path), e.content) << e.path;
    EXPECT_FALSE(xt::FileExists(usb1 + "1-2/serial"));

    xt::UnplugUsbDevice("lp0");
    for (const char *gone : {"/sys/class/usbmisc/lp0", "/sys/bus/usb/devices/1-1",
                             "/sys/devices/pci0000:00/0000:00:14.0/usb1/1-1"}) {
        EXPECT_FALSE(xt::FileExists(gone)) << gone;
    }
    EXPECT_EQ(xt::ReadFile("/sys/class/usbmisc/lp1/dev"), "180:1\n");
}

}  // namespace
