// Proof of child hygiene, through the library's own operations with fake
// tools at the paths the library runs (each run by a different entry point
// of the platform's runner): no descriptor of the caller's reaches a tool,
// nothing is left behind, a caller's SIGCHLD handling never changes a
// result, and a tool that never exits is stopped within its limit.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <functional>
#include <string>

#include "appliance/standin_control.h"
#include "sandbox/sandbox.h"
#include "support/paths.h"
#include "support/processes.h"
#include "support/proof_tally.h"
#include "xavoprinter.h"

using namespace xavo::test;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";
constexpr double kGrace = 2.0;  // the runner's SIGTERM-to-SIGKILL grace
constexpr double kSlack = 1.5;  // a loaded machine's delay on top

// Every fake tool first writes down the descriptors it was given (ls adds
// its own 3, the directory it lists).
void PlaceTool(const char *szPath, const std::string &body) {
    const std::string name = std::strrchr(szPath, '/') + 1;
    PlaceProgram(szPath, "#!/bin/sh\nls /proc/self/fd > /tmp/fds." + name + "\n" + body);
}

// One run of each entry point of the runner, each answer told apart; what
// each answers with the tools below: the ID read, online, ejected, release
// refused by the tool, printed, spool emptied.
struct Operation {
    const char *szName;
    const char *szTool;  // the program it runs, and how
    std::function<int32_t()> call;
    int32_t answer;
};
const Operation kOperations[] = {
    {"XAVOPrinterNetGetStringId", "/usr/bin/snmpwalk",  // ORLICPopen
     [] {
         char szId[64] = {};
         const int32_t r = XAVOPrinterNetGetStringId("10.0.0.1", szId, sizeof szId);
         return r * 10 + (std::strcmp(szId, "MFG:ACME;MDL:X;") == 0 ? 1 : 0);
     },
     1},
    {"XAVOPrinterNetPingStatus", "/bin/ping",  // ORLICPopen
     [] {
         char szStatus[16] = {};
         const int32_t r = XAVOPrinterNetPingStatus("10.0.0.1", szStatus, sizeof szStatus);
         return r * 10 + (std::strcmp(szStatus, "Online") == 0 ? 1 : 0);
     },
     1},
    {"XAVOPrinterUsbipEject", "/usr/bin/bind_driver", [] { return XAVOPrinterUsbipEject(kPrinter); }, 0},  // ORLICExec
    {"XAVOPrinterUsbipLockRelease", "/usr/bin/bind_driver", [] { return XAVOPrinterUsbipLockRelease("failing"); },
     -1},  // ORLICExecl
    {"XAVOPrinterCupsPrintFile", "/usr/bin/lpr",
     [] { return XAVOPrinterCupsPrintFile(kPrinter, "/tmp/doc.txt", "doc", 0); }, 0},  // ORLICExecv
    {"XAVOPrinterCleanSpool", "/usr/bin/lprm", [] { return XAVOPrinterCleanSpool(); }, 0},
};

void PlaceTools() {
    PlaceTool("/usr/bin/snmpwalk", "echo 'x = STRING: \"MFG:ACME;MDL:X;\"'\n");
    PlaceTool("/bin/ping", "echo '1 packets transmitted, 1 received, 0% packet loss, time 0ms'\n");
    PlaceTool("/usr/bin/bind_driver", "[ \"$2\" = failing ] && exit 1\nexit 0\n");
    PlaceTool("/usr/bin/lpr", "exit 0\n");
    PlaceTool("/usr/bin/lprm", "exit 0\n");
    PlaceFile(kConf, std::string("[") + kPrinter + "]\n\tcups printer name = usbprinter1\n");
    PlaceFile("/tmp/doc.txt", "text\n");
}

// Runs the mix once; every answer checked.
void RunMix(Tally *pTally, const std::string &setting) {
    for (const Operation &op : kOperations) {
        const int32_t r = op.call();
        pTally->Check(r == op.answer, setting + ": " + op.szName + " answered " + std::to_string(r));
    }
}

void DescriptorsAndLeftovers(Tally *pTally) {
    // Descriptors of the caller's of several kinds, with and without
    // close-on-exec.
    const int plain = open("/dev/null", O_RDONLY);
    const int cloexec = open("/dev/null", O_RDONLY | O_CLOEXEC);
    int ends[2] = {-1, -1};
    pTally->Check(pipe(ends) == 0 && plain >= 0 && cloexec >= 0, "the caller's descriptors");
    const int sock = socket(AF_UNIX, SOCK_STREAM, 0);
    RunMix(pTally, "default");
    for (const Operation &op : kOperations) {
        const std::string name = std::strrchr(op.szTool, '/') + 1;
        const std::string fds = ReadFile("/tmp/fds." + name);
        pTally->Check(fds == "0\n1\n2\n3\n", name + " was given descriptors " + fds);
    }
    for (int fd : {plain, cloexec, ends[0], ends[1], sock}) close(fd);
    pTally->Check(Descendants().empty(), "a process or zombie left after the mix");
}

void SigchldSettings(Tally *pTally) {
    for (const SigchldSetting &s : kSigchldSettings) {
        {
            SigchldScope scope(s);
            for (int round = 0; round < 3; ++round) RunMix(pTally, s.szName);
        }
        // A caller's handler runs for its own child only, never for a tool.
        pTally->Check(gReapingHandlerCalls == (s.handler == ReapEveryChild ? 1 : 0),
                      std::string(s.szName) + ": the handler ran " + std::to_string(gReapingHandlerCalls) + " times");
        pTally->Check(NothingLeft(), std::string(s.szName) + ": a process or zombie left");
    }
}

// A call whose tool never exits returns within the tool's limit and the
// grace, and the tool's process group is gone (that a tool which ends at
// SIGTERM ends at the limit is the runner's own test).
void Bounded(Tally *pTally) {
    XavoStandinSetToolTimeLimit(1);
    // lprm and what it starts ignore SIGTERM: SIGKILL after the grace; the
    // spool cleaning goes on as after any failed lprm.
    PlaceTool("/usr/bin/lprm", "trap '' TERM\nsleep 1000 &\necho $! > /tmp/lprm.child\nwhile :; do sleep 1; done\n");
    const auto start = std::chrono::steady_clock::now();
    const int32_t cleaned = XAVOPrinterCleanSpool();
    const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    pTally->Check(cleaned == 0, "the spool cleaning answered " + std::to_string(cleaned));
    pTally->Check(seconds >= 1 + kGrace - 0.2 && seconds < 1 + kGrace + kSlack,
                  "the spool cleaning took " + std::to_string(seconds) + " s");
    pTally->Check(EndsSoon(std::stoi(ReadFile("/tmp/lprm.child"))), "lprm's own child still runs");
    pTally->Check(NothingLeft(), "lprm: a process or zombie left");
    XavoStandinSetToolTimeLimit(0);
}

}  // namespace

TEST(ProofChildren, ChildHygiene) {
    PlaceTools();
    Tally tally{"child hygiene"};
    DescriptorsAndLeftovers(&tally);
    SigchldSettings(&tally);
    Bounded(&tally);
}
