// The test sandbox.
//
// Every test executable's main() (sandbox_main.cc) enters a private mount
// and network namespace before GoogleTest starts.  Inside it the paths the
// library works on are private: /usr, /etc and /var are overlays whose
// writes vanish with the sandbox, /tmp and /run are fresh tmpfs, /dev is a
// private tmpfs holding the few real nodes tests need, /sys is a fake tree
// (the USB devices behind "lp0" and "lp1"), and loopback is up in an
// otherwise empty network.  Nothing a test does reaches the host.
//
// Before every test the writable layers are made fresh again, unless the
// suite asked for one sandbox for all its tests (XAVO_SANDBOX_PER_SUITE).
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <string>
#include <vector>

namespace xavo::test {

// ---- life cycle -------------------------------------------------------
// Called by main() while the process is still single-threaded.
void EnterSandbox();
// Fresh writable layers (/usr, /etc, /var overlays; /tmp, /run tmpfs), the
// fake sysfs restored, device state and counters cleared, captured logs
// dropped.  Done automatically before each test.
void ResetSandbox();
// Marks a suite whose tests share one sandbox: reset before its first test
// only.  Use at namespace scope: XAVO_SANDBOX_PER_SUITE(CupsQueues);
bool RegisterPerSuite(const char *szSuite);
#define XAVO_SANDBOX_PER_SUITE(suite) \
    static const bool xavo_per_suite_##suite = ::xavo::test::RegisterPerSuite(#suite)

// ---- files and programs -----------------------------------------------
// Writes a file at an absolute path inside the sandbox, creating its
// directories.
void PlaceFile(const std::string &path, const std::string &content, mode_t mode = 0644);
// Places an executable script (its text starts with "#!") at a program path
// of the library, such as "/usr/bin/lpadmin".
void PlaceProgram(const std::string &path, const std::string &script);
std::string ReadFile(const std::string &path);  // "" when missing
bool FileExists(const std::string &path);

// ---- syslog -----------------------------------------------------------
struct LogLine {
    int priority;         // 0..7 (LOG_ERR is 3, LOG_DEBUG 7)
    std::string message;  // the text the library passed, as sent
};
// Every line logged (by this process and its children) since the last call
// or the last reset.
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
    std::string deviceIdReply;    // raw reply: two length bytes, then text
    bool resetAccepted = true;    // LPIOC_SOFT_RESET answer
};
struct UsblpSeen {
    int opens = 0;                          // open() attempts on the node
    std::vector<std::uint32_t> requests;    // ioctl request numbers, in order
    int openNow = 0;                        // descriptors currently open
};
void SetUsblp(const std::string &devName, const UsblpConfig &config);  // devName: "lp0"
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
void PlugUsbDevice(const UsbDevice &device);
void UnplugUsbDevice(const std::string &devName);

}  // namespace xavo::test
