// The processes started inside the sandbox: listed for the tests, named
// when a test leaves them running, stopped at the end of the run.
#include <dirent.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace xavo::test {
namespace detail {
namespace {

struct ProcStat {
    pid_t pid;
    pid_t ppid;
    char state;
    std::string comm;
};

std::vector<ProcStat> AllProcesses() {
    std::vector<ProcStat> out;
    DIR *d = opendir("/proc");
    if (d == nullptr) return out;
    while (dirent *e = readdir(d)) {
        char *end = nullptr;
        const long pid = std::strtol(e->d_name, &end, 10);
        if (pid <= 0 || *end != '\0') continue;
        const std::string text = ReadFile(std::string("/proc/") + e->d_name + "/stat");
        // "pid (comm) S ppid ...": comm may hold spaces and parentheses.
        const auto open = text.find('(');
        const auto close = text.rfind(')');
        if (open == std::string::npos || close == std::string::npos || close + 4 > text.size()) continue;
        ProcStat p{static_cast<pid_t>(pid), 0, text[close + 2], text.substr(open + 1, close - open - 1)};
        p.ppid = static_cast<pid_t>(std::strtol(text.c_str() + close + 4, nullptr, 10));
        out.push_back(p);
    }
    closedir(d);
    return out;
}

}  // namespace

void ReportLeftovers(const std::string &what) {
    // Zombies are not named: a daemon that detached and was stopped by its
    // test is this process's child now, and only this process reaps it (at
    // the next reset).
    for (const SandboxProcess &p : Descendants()) {
        if (p.state == 'Z') continue;
        std::fprintf(stderr, "[ sandbox  ] still running after %s: pid %d (%s)\n", what.c_str(),
                     static_cast<int>(p.pid), p.comm.c_str());
    }
}

void StopLeftovers() {
    if (!OwnsSandbox()) return;
    std::vector<SandboxProcess> left = Descendants();
    if (left.empty()) return;
    ReportLeftovers("the last test");
    for (const SandboxProcess &p : left) {
        if (p.state != 'Z') kill(p.pid, SIGTERM);
    }
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(3);
    while (std::chrono::steady_clock::now() < deadline) {
        bool running = false;
        for (const SandboxProcess &p : Descendants()) running = running || p.state != 'Z';
        if (!running) break;
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    for (const SandboxProcess &p : Descendants()) {
        if (p.state != 'Z') kill(p.pid, SIGKILL);
    }
    // Reap our own children; the others become ours as their parents die.
    for (int i = 0; i < 50 && !Descendants().empty(); ++i) {
        while (waitpid(-1, nullptr, WNOHANG) > 0) {
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}

}  // namespace detail

using namespace detail;

std::vector<SandboxProcess> Descendants() {
    const std::vector<ProcStat> all = AllProcesses();
    std::set<pid_t> tree{getpid()};
    std::vector<SandboxProcess> out;
    // Parents are not always listed before their children: repeat until no
    // new descendant turns up.
    for (bool grew = true; grew;) {
        grew = false;
        for (const ProcStat &p : all) {
            if (tree.count(p.ppid) != 0 && tree.insert(p.pid).second) {
                out.push_back({p.pid, p.state, p.comm});
                grew = true;
            }
        }
    }
    return out;
}

}  // namespace xavo::test
