// xavoprinter-demo: the appliance's printers from plug-in to print, in a
// sandbox that stands for a whole appliance.
//
// The demo enters private mount and network namespaces (the sandbox of the
// test suites), so the library's absolute paths ("/usr/xavo/etc/printer.conf",
// "/tmp/usbtab", "/dev/usb/lp0", CUPS's files) are private, and starts the
// appliance's peers inside: a real cupsd, a simulated USB printer on "lp0"
// that answers a device ID string, and a network printer on 127.0.0.1 (a
// real snmpd answering for it, a socket listener on port 9100 receiving
// its jobs).  Then it walks through the appliance's life with the
// xavoprinter command, printing every command so that a person can repeat
// it.  Everything lives in namespaces and tmpfs: when the demo ends, by
// success, failure or Ctrl-C, nothing is left on the host.
//
//   xavoprinter-demo           the walk-through; exit 0 when every step did
//                              what it should
//   xavoprinter-demo --shell   the same, then a shell inside the sandbox,
//                              with the printers still there, before the
//                              clean-up steps
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <memory>
#include <regex>
#include <string>
#include <vector>

#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"
#include "sandbox/snmpd.h"
#include "sandbox/socket_listener.h"

extern char **environ;

namespace {

using xavo::test::PlaceFile;
using xavo::test::PlaceProgram;

constexpr char kUsbDev[] = "lp0";
constexpr char kUsbBus[] = "1-1";
constexpr char kUsbPrinterId[] = "04b8:0005:SN0001";
constexpr char kUsbDeviceId[] = "MFG:ACME;MDL:Model 100;CMD:ESCPL2,PCL;CLS:PRINTER;DES:ACME Model 100;";
// What the USB printer "prints": the CUPS backend for "usb:" URIs below
// appends every job to this file, as the real printer would put it on
// paper.
constexpr char kUsbPaper[] = "/tmp/lp0-paper";
constexpr char kUsbBackend[] =
    "#!/bin/sh\n"
    "# The appliance's USB backend, for the demo: no arguments lists the\n"
    "# device; a job goes to the file that stands for the printer's paper.\n"
    "if [ $# -eq 0 ]; then echo 'direct usb \"ACME Model 100\" \"USB printer on lp0\"'; exit 0; fi\n"
    "if [ -n \"$6\" ]; then cat \"$6\"; else cat; fi >>/tmp/lp0-paper\n";

constexpr char kNetIp[] = "127.0.0.1";
constexpr std::uint16_t kNetPort = 9100;
constexpr char kNetDeviceId[] = "MFG:ACME;MDL:Laser 5;CMD:PCL,POSTSCRIPT;CLS:PRINTER;";
constexpr char kNetUri[] = "socket://127.0.0.1:9100";
constexpr char kNetQueueName[] = "office";

bool g_color = false;
// Set by Ctrl-C, SIGTERM or SIGHUP: the walk stops at the next step and
// the clean-up runs, so that no daemon outlives the demo in the namespaces.
volatile sig_atomic_t g_stop = 0;

void OnStopSignal(int) { g_stop = 1; }

struct Interrupted {};

std::string Paint(const char *code, const std::string &text) {
    return g_color ? std::string("\033[") + code + "m" + text + "\033[0m" : text;
}

void Say(const std::string &text) { std::printf("%s\n", text.c_str()); std::fflush(stdout); }

// An argv or envp view of words, which must outlive it.
std::vector<char *> Pointers(const std::vector<std::string> &words) {
    std::vector<char *> out;
    for (const std::string &w : words) out.push_back(const_cast<char *>(w.c_str()));
    out.push_back(nullptr);
    return out;
}

// The child's exit status; -1 when it was killed.
int WaitExit(pid_t pid) {
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

struct Ran {
    int status = -1;  // exit status, or -1 when it could not run or was killed
    std::string output;
};

// Runs one shell command line in the sandbox and shows its output as it
// comes, indented, keeping a copy for the walk-through's checks.
Ran RunShown(const std::string &command, const std::vector<std::string> &env) {
    int fds[2];
    Ran ran;
    if (pipe2(fds, O_CLOEXEC) != 0) return ran;
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, fds[1], STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, fds[1], STDERR_FILENO);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    const std::vector<std::string> args = {"/bin/sh", "-c", command};
    std::vector<char *> argv = Pointers(args);
    std::vector<char *> envp = Pointers(env);
    pid_t pid = -1;
    int rc = posix_spawn(&pid, "/bin/sh", &actions, nullptr, argv.data(), envp.data());
    posix_spawn_file_actions_destroy(&actions);
    close(fds[1]);
    if (rc == 0) {
        std::string pending;
        char buf[4096];
        for (;;) {
            ssize_t n = read(fds[0], buf, sizeof buf);
            if (n < 0 && errno == EINTR) continue;
            if (n <= 0) break;
            ran.output.append(buf, static_cast<size_t>(n));
            pending.append(buf, static_cast<size_t>(n));
            for (size_t nl; (nl = pending.find('\n')) != std::string::npos; pending.erase(0, nl + 1)) {
                Say("    " + pending.substr(0, nl));
            }
        }
        if (!pending.empty()) Say("    " + pending);
        ran.status = WaitExit(pid);
    }
    close(fds[0]);
    return ran;
}

// The library's own syslog lines ("unit:line message") logged during a
// step; the daemons' lines are left out.
void ShowLibraryLog() {
    static const std::regex kLibraryLine("^[a-z_]+:[0-9]+ .*");
    for (const xavo::test::LogLine &line : xavo::test::TakeLogs()) {
        if (std::regex_match(line.message, kLibraryLine)) Say(Paint("2", "    syslog: " + line.message));
    }
}

class Walk {
public:
    explicit Walk(std::vector<std::string> env) : env_(std::move(env)) {}

    void Chapter(const std::string &title) { Say("\n" + Paint("1", "== " + title)); }
    void Note(const std::string &text) { Say(Paint("36", "   " + text)); }

    // One step: shows the command, runs it, checks its exit status and,
    // when given, a text its output must hold.
    Ran Step(const std::string &command, int wantStatus = 0, const std::string &mustShow = "") {
        if (g_stop) throw Interrupted{};
        Say(Paint("33", "$ " + command));
        Ran ran = RunShown(command, env_);
        ShowLibraryLog();
        const bool bOk = ran.status == wantStatus && ran.output.find(mustShow) != std::string::npos;
        if (!bOk) {
            ++failures_;
            Say(Paint("31", "   !! expected exit status " + std::to_string(wantStatus) +
                                (mustShow.empty() ? "" : " and \"" + mustShow + "\"") + ", got " +
                                std::to_string(ran.status)));
        }
        ++steps_;
        return ran;
    }
    void Check(bool bOk, const std::string &what) {
        ++steps_;
        if (!bOk) ++failures_;
        Say(Paint(bOk ? "32" : "31", std::string("   ") + (bOk ? "ok: " : "!! ") + what));
    }
    int failures() const { return failures_; }
    int steps() const { return steps_; }
    const std::vector<std::string> &env() const { return env_; }

private:
    std::vector<std::string> env_;
    int steps_ = 0;
    int failures_ = 0;
};

// The value of a "key": "value" pair in the one-line JSON object that
// xavoprinter --json prints; "" when absent.
std::string JsonText(const std::string &json, const std::string &key) {
    const std::string head = "\"" + key + "\":\"";
    size_t at = json.find(head);
    if (at == std::string::npos) return "";
    at += head.size();
    std::string value;
    for (; at < json.size() && json[at] != '"'; ++at) {
        if (json[at] == '\\' && at + 1 < json.size()) ++at;
        value += json[at];
    }
    return value;
}

std::string Quoted(const std::string &word) {
    if (word.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._:/-") ==
        std::string::npos && !word.empty()) {
        return word;
    }
    std::string out = "'";
    for (char c : word) out += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return out + "'";
}

void SetTheStage() {
    xavo::test::SetRealSleep(true);
    xavo::test::Cupsd::Start();
    PlaceProgram("/usr/lib/cups/backend/usb", kUsbBackend);

    xavo::test::PlugUsbDevice({.devName = kUsbDev, .busId = kUsbBus, .vendor = 0x04b8, .product = 0x0005,
                               .serial = "SN0001", .manufacturer = "ACME", .productName = "Model 100"});
    xavo::test::SetUsblp(kUsbDev, {.deviceIdReply = xavo::test::UsblpReply(kUsbDeviceId)});

    xavo::test::PlaceSnmpClientConfig();
}

int RunDemo(bool bShell, const std::string &cliDir, const std::string &preload) {
    const char *term = std::getenv("TERM");
    std::vector<std::string> env = {
        "PATH=" + cliDir + ":/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin",
        // Programs see the simulated usblp devices through this shim; their
        // sleeps are real.
        "LD_PRELOAD=" + preload, "HOME=/root", "LANG=C.UTF-8", std::string("TERM=") + (term ? term : "dumb"),
        "PS1=[appliance sandbox] \\w# "};
#ifdef XAVO_DEMO_SANITIZED
    // A sanitized build's programs refuse a preloaded library ahead of the
    // sanitizer runtime unless told that this one is expected.
    env.push_back("ASAN_OPTIONS=verify_asan_link_order=0:detect_leaks=1");
#endif

    Say(Paint("1", "xavoprinter demo: a network storage appliance's printers, in a sandbox"));
    Say("Private mount and network namespaces: /usr /etc /var are overlays whose writes vanish, /tmp /run /dev");
    Say("are fresh, the network is loopback only. Nothing here touches the host.");
    SetTheStage();
    Say("Started: cupsd (pid " + std::to_string(xavo::test::Cupsd::Pid()) + "), a USB printer ACME Model 100 on " +
        kUsbDev + " (bus " + kUsbBus + "),");
    xavo::test::SnmpAgent snmp(kNetIp, {{".1.1.0", "integer", "7"},
                                        {".1.2.0", "octet_str", kNetDeviceId},
                                        {".1.3.0", "octet_str", kNetUri}});
    xavo::test::SocketListener netPrinter(kNetPort);
    Say(std::string("and a network printer ACME Laser 5 on ") + kNetIp + " (snmpd answering for it, port " +
        std::to_string(netPrinter.Port()) + " receiving its jobs).");
    if (!snmp.running() || netPrinter.Port() != kNetPort || xavo::test::Cupsd::Pid() <= 0) {
        Say(Paint("31", "the appliance's peers did not start"));
        return 1;
    }
    xavo::test::TakeLogs();

    Walk walk(env);
    const std::string usb = kUsbPrinterId;

    walk.Chapter("A USB printer is plugged in");
    walk.Note("The hotplug handler asks the printer who it is, then registers it.");
    walk.Step(std::string("xavoprinter usb devid ") + kUsbDev, 0, "Model 100");
    walk.Step(std::string("xavoprinter usb enable ") + kUsbDev + " " + kUsbBus);
    walk.Note("Its table line, its section of the printer configuration, and the Samba printers share:");
    walk.Step("cat /tmp/usbtab", 0, kUsbDev);
    walk.Step("xavoprinter show " + usb, 0, "Model 100");
    walk.Step("cat /etc/samba/smb.reserved.conf", 0, "[printers]");
    walk.Note("The share counts as active from eight entries on: the library writes seven, the appliance's");
    walk.Note("Samba service adds its own. Until then the library reports it inactive and logs why:");
    walk.Step("xavoprinter share status", 0, "printers_share_active: no");
    walk.Step("xavoprinter list", 0, usb);

    walk.Chapter("Its CUPS queue");
    walk.Note("The queue is created disabled; usbprinter1 also gets the alias usbprinter. Disabling the");
    walk.Note("alias before it exists fails, is logged, and creation goes on.");
    walk.Step("xavoprinter queue add " + usb, 0, "usbprinter1");
    walk.Step("xavoprinter queue enable usbprinter1");
    walk.Step("lpstat -v", 0, "usb:/dev/usb/" + usb);

    walk.Chapter("The test page");
    walk.Step("xavoprinter print test-page " + usb);
    walk.Note("lpq names the job by its file, testprint; wait until it has left the queue:");
    walk.Step("xavoprinter job wait " + usb + " testprint --timeout 30", 0, "complete");
    walk.Step(std::string("wc -c <") + kUsbPaper, 0, std::to_string(xavo::test::ReadFile("/usr/share/cups/data/testprint").size()));

    walk.Chapter("A network printer");
    walk.Step(std::string("xavoprinter net ping ") + kNetIp, 0, "Online");
    walk.Note("Identified by SNMP (then mDNS and BJNP when SNMP finds nothing):");
    Ran probe = walk.Step(std::string("xavoprinter net probe ") + kNetIp + " --json", 0, "\"identified_by\":\"snmp\"");
    const std::string backend = JsonText(probe.output, "backend");
    const std::string queue = JsonText(probe.output, "queue");
    const std::string brand = JsonText(probe.output, "brand");
    const std::string model = JsonText(probe.output, "model");
    const std::string deviceId = JsonText(probe.output, "device_id");
    walk.Note("Registered with what the probe found: section, table line, share, queue:");
    std::string add = std::string("xavoprinter net add ") + kNetIp + " " + kNetQueueName + " --backend " +
                      Quoted(backend.empty() ? "socket" : backend);
    if (!queue.empty()) add += " --queue " + Quoted(queue);
    if (!brand.empty()) add += " --brand " + Quoted(brand);
    if (!model.empty()) add += " --model " + Quoted(model);
    if (!deviceId.empty()) add += " --device-id " + Quoted(deviceId);
    walk.Step(add, 0, "socket://127.0.0.1");
    const std::string net = std::string(kNetIp) + "-" + kNetQueueName;
    walk.Step("cat /usr/xavo/etc/nptab", 0, kNetQueueName);
    walk.Step(std::string("xavoprinter net check ") + kNetIp + " " + kNetQueueName, 0, "in use for this address");
    walk.Step(std::string("cupsenable ") + kNetQueueName);

    walk.Chapter("A file printed on the network printer");
    const std::string letter = "Dear printer,\nthese bytes came from the appliance.\n";
    PlaceFile("/tmp/letter.txt", letter);
    walk.Step("cat /tmp/letter.txt");
    walk.Step("xavoprinter print " + net + " /tmp/letter.txt --title letter");
    walk.Step("xavoprinter job wait " + net + " letter --timeout 30", 0, "complete");
    const std::string got = netPrinter.WaitForBytes(letter.size(), 10000);
    Say(std::string("   the printer on ") + kNetIp + ":" + std::to_string(kNetPort) + " received " +
        std::to_string(got.size()) + " bytes");
    walk.Check(got == letter, "the bytes that arrived are the file's");

    if (bShell) {
        Say("\n" + Paint("1", "== A shell in the sandbox"));
        Say("The printers are still there: try 'xavoprinter --help', 'xavoprinter list', 'lpstat -t',");
        Say("'cat /usr/xavo/etc/printer.conf', 'testparm -s /etc/samba/smb.reserved.conf'.");
        Say("Leave with 'exit': the demo then unplugs the printer and cleans up.");
        pid_t pid = -1;
        const std::vector<std::string> args = {"/bin/bash", "--norc"};
        std::vector<char *> argv = Pointers(args);
        std::vector<char *> envp = Pointers(env);
        if (posix_spawn(&pid, argv[0], nullptr, nullptr, argv.data(), envp.data()) == 0) WaitExit(pid);
        // Ctrl-C typed in the shell reached the demo too: it was meant for
        // the shell's commands.
        g_stop = 0;
        xavo::test::TakeLogs();
    }

    walk.Chapter("Unplugged, and cleaned up");
    xavo::test::UnplugUsbDevice(kUsbDev);
    xavo::test::SetUsblp(kUsbDev, {.present = false});
    walk.Step(std::string("xavoprinter usb disable ") + kUsbDev + " " + kUsbBus);
    walk.Step("xavoprinter queue remove " + usb);
    walk.Step(std::string("xavoprinter net remove ") + kNetIp + " " + kNetQueueName);
    walk.Note("Cancelling every job asks lprm for \"all\", which Debian's lprm does not know: the library");
    walk.Note("logs that and empties the spool directory anyway.");
    walk.Step("xavoprinter spool clean", 0, "cleaned: yes");
    walk.Step("xavoprinter list", 0, "(no printers)");
    walk.Step("lpstat -v", 1, "No destinations");
    walk.Note("The USB printer's section stays, so a printer that comes back keeps its queue name:");
    walk.Step("xavoprinter show " + usb, 0, "cups printer name");

    Say("\n" + Paint(walk.failures() == 0 ? "32;1" : "31;1",
                     std::to_string(walk.steps() - walk.failures()) + " of " + std::to_string(walk.steps()) +
                         " steps did what they should."));
    return walk.failures() == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char **argv) {
    bool bShell = false;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--shell") == 0) {
            bShell = true;
        } else if (std::strcmp(argv[i], "--help") == 0 || std::strcmp(argv[i], "-h") == 0) {
            std::printf(
                "usage: xavoprinter-demo [--shell]\n\n"
                "Starts a sandbox standing for a whole appliance (private cupsd, a simulated USB printer on\n"
                "lp0, a network printer on 127.0.0.1) and walks through the printers' life with xavoprinter.\n"
                "Needs root (namespaces and mounts); leaves nothing on the host.\n\n"
                "  --shell   open a shell inside the sandbox before the clean-up steps\n");
            return 0;
        } else {
            std::fprintf(stderr, "xavoprinter-demo: unknown argument '%s' (see --help)\n", argv[i]);
            return 2;
        }
    }
    g_color = isatty(STDOUT_FILENO) == 1;
    // The namespaces are entered while the process has a single thread.
    xavo::test::EnterSandbox();
    xavo::test::ResetSandbox();
    struct sigaction stop {};
    stop.sa_handler = OnStopSignal;
    sigemptyset(&stop.sa_mask);
    for (int sig : {SIGINT, SIGTERM, SIGHUP}) sigaction(sig, &stop, nullptr);
    int status = 1;
    try {
        status = RunDemo(bShell, XAVO_DEMO_CLI_DIR, XAVO_DEMO_PRELOAD);
    } catch (const Interrupted &) {
        std::fprintf(stderr, "\nxavoprinter-demo: interrupted; cleaning up\n");
        status = 130;
    } catch (const std::exception &e) {
        std::fprintf(stderr, "xavoprinter-demo: %s\n", e.what());
    }
    xavo::test::Cupsd::Stop();
    // Whatever else was started inside (a job's backend, a shell's
    // children) is stopped by its id before the sandbox goes.
    xavo::test::detail::StopLeftovers();
    const std::vector<xavo::test::SandboxProcess> left = xavo::test::Descendants();
    if (left.empty()) {
        Say("Stopped cupsd, snmpd and the printers; the sandbox's files go with its namespaces.");
    } else {
        for (const xavo::test::SandboxProcess &p : left) {
            std::fprintf(stderr, "xavoprinter-demo: still running: %d %s\n", static_cast<int>(p.pid), p.comm.c_str());
        }
        status = 1;
    }
    return status;
}
