// xavoprinter-demo: the appliance's printers from plug-in to print, in a
// sandbox that stands for a whole appliance.
//
// The demo enters private mount and network namespaces (the sandbox of the
// test suites), so the library's absolute paths ("/usr/xavo/etc/printer.conf",
// "/tmp/usbtab", "/dev/usb/lp0", CUPS's files) are private, and starts the
// appliance's peers inside: a real cupsd, a simulated USB printer on "lp0"
// that answers a device ID string, a network printer on 127.0.0.1 (a
// real snmpd answering for it, a socket listener on port 9100 receiving
// its jobs), and an IPP printer on 127.0.0.2 that only mDNS makes known
// (CUPS's ippeveprinter, announced by the sandbox's own avahi-daemon, seen
// through the real avahi-browse); the BJNP backend is Debian's (see
// stage.h).  Then it walks through the appliance's life with the
// xavoprinter command, printing every command so that a person can repeat
// it.  Everything lives in namespaces and tmpfs: when the demo ends, by
// success, failure or Ctrl-C, nothing is left on the host.
//
//   xavoprinter-demo           the walk-through; exit 0 when every step did
//                              what it should
//   xavoprinter-demo --shell   the same, then a shell inside the sandbox,
//                              with the printers still there, before the
//                              clean-up steps
#include <signal.h>
#include <spawn.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>
#include <vector>

#include "demo/chapters.h"
#include "demo/stage.h"
#include "demo/walk.h"
#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"
#include "sandbox/snmpd.h"
#include "sandbox/socket_listener.h"

namespace {

using namespace xavo::demo;
using xavo::test::PlaceFile;

void UsbChapters(Walk &walk) {
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
}

void NetworkChapters(Walk &walk, Stage &stage) {
    walk.Chapter("A network printer");
    walk.Step(std::string("xavoprinter net ping ") + kNetIp, 0, "Online");
    walk.Note("Identified by SNMP (then mDNS and BJNP when SNMP finds nothing):");
    Ran probe = walk.Step(std::string("xavoprinter net probe ") + kNetIp + " --json", 0, "\"identified_by\":\"snmp\"");
    walk.Note("Registered with what the probe found: section, table line, share, queue:");
    walk.Step(NetAddCommand(kNetIp, kNetQueueName, probe.output), 0, "socket://127.0.0.1");
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
    const std::string got = stage.SocketPrinterGot(letter.size(), 10000);
    Say(std::string("   the printer on ") + kNetIp + ":" + std::to_string(kNetPort) + " received " +
        std::to_string(got.size()) + " bytes");
    walk.Check(got == letter, "the bytes that arrived are the file's");
}

void OpenShell(Walk &walk) {
    walk.Chapter("A shell in the sandbox");
    Say("The printers are still there: try 'xavoprinter --help', 'xavoprinter list', 'lpstat -t',");
    Say("'cat /usr/xavo/etc/printer.conf', 'testparm -s /etc/samba/smb.reserved.conf', 'avahi-browse -arpt',");
    Say(std::string("'xavoprinter net probe ") + kMdnsIp + "'.");
    Say("Leave with 'exit': the demo then unplugs the printer and cleans up.");
    pid_t pid = -1;
    const std::vector<std::string> args = {"/bin/bash", "--norc"};
    std::vector<char *> argv = Pointers(args);
    std::vector<char *> envp = Pointers(walk.env());
    if (posix_spawn(&pid, argv[0], nullptr, nullptr, argv.data(), envp.data()) == 0) WaitExit(pid);
    // Ctrl-C typed in the shell reached the demo too: it was meant for
    // the shell's commands.
    g_stop = 0;
    xavo::test::TakeLogs();
}

void CleanUpChapter(Walk &walk) {
    const std::string usb = kUsbPrinterId;

    walk.Chapter("Unplugged, and cleaned up");
    xavo::test::UnplugUsbDevice(kUsbDev);
    xavo::test::SetUsblp(kUsbDev, {.present = false});
    walk.Step(std::string("xavoprinter usb disable ") + kUsbDev + " " + kUsbBus);
    walk.Step("xavoprinter queue remove " + usb);
    walk.Step(std::string("xavoprinter net remove ") + kNetIp + " " + kNetQueueName);
    walk.Step(std::string("xavoprinter net remove ") + kMdnsIp + " " + kMdnsQueueName);
    walk.Note("Cancelling every job asks lprm for \"all\", which Debian's lprm does not know: the library");
    walk.Note("logs that and empties the spool directory anyway.");
    walk.Step("xavoprinter spool clean", 0, "cleaned: yes");
    walk.Step("xavoprinter list", 0, "(no printers)");
    walk.Step("lpstat -v", 1, "No destinations");
    walk.Note("The USB printer's section stays, so a printer that comes back keeps its queue name:");
    walk.Step("xavoprinter show " + usb, 0, "cups printer name");
}

std::vector<std::string> WalkEnvironment(const std::string &cliDir, const std::string &preload) {
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
    return env;
}

int RunDemo(bool bShell, const std::string &cliDir, const std::string &preload) {
    Say(Paint("1", "xavoprinter demo: a network storage appliance's printers, in a sandbox"));
    Say("Private mount and network namespaces: /usr /etc /var are overlays whose writes vanish, /tmp /run /dev");
    Say("are fresh, the network is loopback only. Nothing here touches the host.");
    SetTheStage();
    Stage stage;
    if (const std::string missing = stage.Missing(); !missing.empty()) {
        Say(Paint("31", "the appliance's peers did not start:" + missing));
        Say(Stage::MdnsLogs());
        return 1;
    }
    xavo::test::TakeLogs();

    Walk walk(WalkEnvironment(cliDir, preload));
    UsbChapters(walk);
    NetworkChapters(walk, stage);
    MdnsChapters(walk, stage);
    NobodyChapter(walk);
    if (bShell) OpenShell(walk);
    CleanUpChapter(walk);

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
                "lp0, a network printer on 127.0.0.1, an IPP printer on 127.0.0.2 known only by mDNS) and\n"
                "walks through the printers' life with xavoprinter.\n"
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
        Say("Stopped cupsd, snmpd, avahi-daemon, dbus-daemon and the printers; the sandbox's files go with its\n"
            "namespaces.");
    } else {
        for (const xavo::test::SandboxProcess &p : left) {
            std::fprintf(stderr, "xavoprinter-demo: still running: %d %s\n", static_cast<int>(p.pid), p.comm.c_str());
        }
        status = 1;
    }
    return status;
}
