// The appliance sandbox.
//
// Every test executable's main() (tests/sandbox_main.cc), and the demo,
// enter a private mount and network namespace first thing.  Inside it the paths the
// library works on are private: /usr, /etc, /var and /root are overlays
// whose writes vanish with the sandbox, /tmp and /run are fresh tmpfs, /dev
// is a private tmpfs holding the few real nodes tests need, /sys is a fake
// tree (the USB devices the test plugs in), and loopback is up in an
// otherwise empty network.  Nothing a test does reaches the host.  Other
// paths (/home, /opt, /work...) are the host's: tests never write there.
//
// Before every test the writable layers are made fresh again, unless the
// suite asked for one sandbox for all its tests (XAVO_SANDBOX_PER_SUITE).
// The renewal runs after SetUpTestSuite() of an ordinary suite, so a suite
// that prepares files or starts daemons there must be a per-suite one; and
// whatever a global test environment places is gone by the first test.
//
// What a fresh sandbox holds besides the host's files: /run/lock,
// /run/xavosdk/lock (the SDK's lock directory), /usr/xavo/etc, and
// /usr/bin/lpadmin, cupsenable and cupsdisable as links to Debian's
// /usr/sbin programs (the appliance keeps them in /usr/bin).  No USB device
// is plugged and no usblp node exists.
//
// Using it:
//   TEST(Queues, CreatesUsbQueue) {
//       xavo::test::PlaceProgram("/usr/bin/lpadmin", "#!/bin/sh\necho \"$@\" >>/tmp/args\n");
//       xavo::test::SetUsblp("lp0", {.deviceIdReply = xavo::test::UsblpReply("MFG:ACME;MDL:X;")});
//       ... call the library ...
//       EXPECT_EQ(xavo::test::ReadFile("/tmp/args"), "...");
//       auto logs = xavo::test::TakeLogs();    // everything logged so far
//       auto sleeps = xavo::test::TakeSleeps();  // e.g. {1000000, 1000000}
//   }
//
// Sleeps: sleep() and usleep() return at once and are recorded, in this
// process and in its forked children.  A test that has to wait itself uses
// std::this_thread::sleep_for (nanosleep, never counted); a test whose
// library calls must really wait for another process calls
// SetRealSleep(true).  Only the two functions are replaced:
// clock_nanosleep and nanosleep stay real.
//
// Children: a forked child shares the sleep records and the usblp devices
// with its test.  A program exec'd by a test is a new image and sees none
// of the interposers, unless run with LD_PRELOAD of the xavo_usblp_preload
// library built beside the tests, which joins the same shared state.
// Every process of the sandbox logs to the same /dev/log, so daemons a
// test starts (cupsd, snmpd) add their own lines to TakeLogs().
//
// Processes: this process is the subreaper of everything started inside
// the sandbox.  Processes still running after a test are named on stderr,
// and those left at the end of the run are stopped by their ids.
// Descendants() lets a test check that a call left nothing, zombies
// included.
//
// The executable must run as root (namespaces, mounts); otherwise it stops
// at once with exit code 70 rather than run a test on the host.  A death
// test that re-executes the binary joins the sandbox it runs in and renews
// nothing.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <string>
#include <vector>

namespace xavo::test {

// ---- life cycle -------------------------------------------------------
// Called by main() while the process is still single-threaded.
void EnterSandbox();
// Fresh writable layers (/usr, /etc, /var, /root overlays; /tmp, /run
// tmpfs), the fake sysfs emptied, usblp devices and sleep records cleared,
// real sleeps off, the platform stand-in's fault injection reset, captured
// logs dropped.  Done automatically before each test.  Processes of the
// previous test are not touched (they may still hold files of the old
// layers).
void ResetSandbox();
// Marks a suite whose tests share one sandbox: reset before its first test
// only.  Use at namespace scope: XAVO_SANDBOX_PER_SUITE(CupsQueues);
bool RegisterPerSuite(const char *szSuite);
#define XAVO_SANDBOX_PER_SUITE(suite) \
    [[maybe_unused]] static const bool xavo_per_suite_##suite = ::xavo::test::RegisterPerSuite(#suite)

// Processes started inside the sandbox (children and theirs) still
// present, zombies included (state 'Z').
struct SandboxProcess {
    pid_t pid;
    char state;        // as in /proc/PID/stat: 'R', 'S', 'Z'...
    std::string comm;  // the program's short name
};
std::vector<SandboxProcess> Descendants();

// The host's view of an absolute path, for checks that nothing leaked out:
// a path through this process's handle on the host's root directory,
// taken before the sandbox was entered.  Read through it, never write.
std::string HostPath(const std::string &path);

// ---- files and programs -----------------------------------------------
// Both write a new file at an absolute path inside the sandbox, creating
// its directories, and replace whatever was there (a link is replaced, not
// followed; a running program is not disturbed).  They throw
// std::system_error when they cannot.
void PlaceFile(const std::string &path, const std::string &content, mode_t mode = 0644);
// Places an executable script (its text starts with "#!") at a program path
// of the library, such as "/usr/bin/lpadmin".
void PlaceProgram(const std::string &path, const std::string &script);
std::string ReadFile(const std::string &path);  // "" when missing
bool FileExists(const std::string &path);       // an entry is there (a dangling link counts)

// ---- syslog -----------------------------------------------------------
struct LogLine {
    int priority;         // 0..7 (LOG_ERR is 3, LOG_DEBUG 7)
    std::string message;  // the text the library passed, as sent
};
// Every line logged (by this process and its children) since the last call
// or the last reset.  A line sent before the call is always in its result:
// the call collects what is queued on the socket itself.
std::vector<LogLine> TakeLogs();

// ---- sleeps -----------------------------------------------------------
// sleep() and usleep() called by the library and the platform are recorded
// in microseconds.  By default they are counted and return at once; real
// mode waits as well (for tests where other processes must make progress).
void SetRealSleep(bool bReal);
std::vector<std::uint64_t> TakeSleeps();

// ---- usblp devices ------------------------------------------------------
// The driver's device nodes "/dev/usb/lpN" as real open()/ioctl() see them.
struct UsblpConfig {
    bool present = true;          // absent: open fails with ENOENT
    int busyOpens = 0;            // the next N opens fail with EBUSY
    int deviceIdFailures = 0;     // the next N device ID requests fail (EIO)
    std::string deviceIdReply{};  // raw reply: two length bytes, then text
    bool resetAccepted = true;    // LPIOC_SOFT_RESET answer
};
struct UsblpSeen {
    int opens = 0;                          // open() attempts on the node
    std::vector<std::uint32_t> requests;    // ioctl request numbers, in order
    int openNow = 0;                        // descriptors currently open (all processes)
    int lastOpenFlags = -1;                 // flags of the last open() attempt
};
// Configures the node "/dev/usb/<devName>"; devName is "lp0", or any
// relative name below /dev/usb ("dev/lp0" stands for "/dev/usb/dev/lp0").
// A name never configured since the reset does not exist (ENOENT).  May be
// called again during a test to change the behaviour: the counters seen go
// on.  At most 8 names per test.
//
// Requests on an open descriptor: the device ID request (0x8FFF5001, or the
// same with another size) copies the reply's first bytes, up to the
// request's size, and returns 0; the soft reset (0x5009) returns 0 or fails
// with EIO; the enable and disable requests (0x40005008, 0x40005007) return
// 0; any other fails with ENOTTY; after the device is made absent every
// request fails with ENODEV.  Every request number is recorded.
//
// Only open(), open64(), openat(), openat64() and their fortified forms are
// seen; fopen() and streams open the node as a plain empty file.
void SetUsblp(const std::string &devName, const UsblpConfig &config);
// What happened to the node since the last reset.
UsblpSeen GetUsblp(const std::string &devName);
// A device ID reply whose two length bytes state text.size() + 2.
std::string UsblpReply(const std::string &text);

// ---- fake USB devices in sysfs -----------------------------------------
struct UsbDevice {
    std::string devName = "lp0";       // usbmisc name
    std::string busId = "1-1";         // USB device directory name
    std::uint16_t vendor = 0x04b8;
    std::uint16_t product = 0x0005;
    std::string serial = "SN0001";     // empty: no serial file
    std::string manufacturer = "ACME";
    std::string productName = "Model 100";
    int interfaceClass = 7;            // 07: printer
};
// Creates, below /sys/devices/pci0000:00/0000:00:14.0/usb1/<busId>:
//   idVendor, idProduct ("%04x\n"), serial (only when not empty),
//   manufacturer, product (text + "\n"),
//   <busId>:1.0/bInterfaceClass ("%02x\n"),
//   <busId>:1.0/usbmisc/<devName>/{dev ("180:N\n"), uevent, device link},
// the link /sys/class/usbmisc/<devName> to that usbmisc directory and the
// links /sys/bus/usb/devices/<busId> and <busId>:1.0.  It does not create
// the usblp node: see SetUsblp.
void PlugUsbDevice(const UsbDevice &device);
void UnplugUsbDevice(const std::string &devName);

}  // namespace xavo::test
