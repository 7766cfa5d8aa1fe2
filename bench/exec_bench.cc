// Starting programs from a large caller: ORLICExec("/bin/true") and
// ORLICPopen("/bin/true") with its ORLICPclose, called by a process with
// 2 GiB resident against the same calls from a small process.  A runner
// that copies its caller's address space (fork) pays for every resident
// page; one that shares it until the exec (vfork, posix_spawn) does not.
// Goal: the large caller within 1.2 times the small one.
//
// Both callers are children of the benchmark, forked before the large one
// fills its memory; the benchmark asks them in turn over a pipe, and each
// reports the CPU time its calls took, its own and that of the programs it
// started (a copied address space costs the caller at the start and the
// started program when it lets the copy go at its exec).
#include <signal.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "bench/bench.h"
#include "xavocore.h"

namespace {

using xavo::bench::Must;

constexpr int kCallsPerRun = 10;

void Calls(char what) {
    for (int i = 0; i < kCallsPerRun; ++i) {
        if (what == 'e') {
            Must(ORLICExec("/bin/true", nullptr, nullptr, nullptr, nullptr) == 0, "ORLICExec");
        } else {
            FILE *out = ORLICPopen("/bin/true", "r", nullptr);
            Must(out != nullptr, "ORLICPopen");
            while (std::fgetc(out) != EOF) {
            }
            Must(ORLICPclose(out) == 0, "ORLICPclose");
        }
    }
}

// A caller: answers each command byte with the CPU ms its calls took
// (negative when they failed); ends at 'q' or when the pipe closes.
[[noreturn]] void Caller(int fd, size_t residentBytes) {
    if (residentBytes > 0) {
        void *p = mmap(nullptr, residentBytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        if (p == MAP_FAILED) _exit(3);
        std::memset(p, 1, residentBytes);  // resident, not just mapped
    }
    char ready = 'r';
    if (write(fd, &ready, 1) != 1) _exit(3);
    char what = 0;
    while (read(fd, &what, 1) == 1 && what != 'q') {
        double ms = -1;
        try {
            const double start = xavo::bench::OwnAndChildrenCpuMs();
            Calls(what);
            ms = xavo::bench::OwnAndChildrenCpuMs() - start;
        } catch (const std::exception &) {
        }
        if (write(fd, &ms, sizeof ms) != static_cast<ssize_t>(sizeof ms)) break;
    }
    _exit(0);
}

struct Child {
    pid_t pid = -1;
    int fd = -1;
};

Child StartCaller(size_t residentBytes) {
    int fds[2];
    Must(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds) == 0, "socketpair");
    pid_t pid = fork();
    Must(pid >= 0, "fork");
    if (pid == 0) {
        close(fds[0]);
        Caller(fds[1], residentBytes);
    }
    close(fds[1]);
    char ready = 0;
    Must(read(fds[0], &ready, 1) == 1 && ready == 'r', "the caller's start");
    return {pid, fds[0]};
}

void Ask(const Child &c, char what) {
    double ms = -1;
    Must(write(c.fd, &what, 1) == 1 && read(c.fd, &ms, sizeof ms) == static_cast<ssize_t>(sizeof ms) && ms >= 0,
         what == 'e' ? "ORLICExec in a caller" : "ORLICPopen in a caller");
    xavo::bench::ReportSample(ms);
}

// Asked to end rather than left to see the pipe close: the other caller,
// forked later, holds a copy of this end too.
void StopCaller(const Child &c) {
    const char quit = 'q';
    Must(write(c.fd, &quit, 1) == 1, "stopping a caller");
    close(c.fd);
    int status = 0;
    waitpid(c.pid, &status, 0);
}

int Run(const xavo::bench::Options &o) {
    // A couple of hundred MiB show a copying runner as well in a smoke run.
    const size_t big = (o.bSmoke ? size_t{256} : size_t{2048}) << 20;
    Child small = StartCaller(0);
    Child large = StartCaller(big);
    std::printf("  %d calls a run; callers of %zu MiB and of a few MiB:\n", kCallsPerRun, big >> 20);
    auto stats = xavo::bench::Interleaved(o, xavo::bench::Clock::kReported,
                                          {
                                              {"ORLICExec, large caller", [&] { Ask(large, 'e'); }},
                                              {"ORLICExec, small caller", [&] { Ask(small, 'e'); }},
                                              {"ORLICPopen+ORLICPclose, large caller", [&] { Ask(large, 'p'); }},
                                              {"ORLICPopen+ORLICPclose, small caller", [&] { Ask(small, 'p'); }},
                                          });
    StopCaller(small);
    StopCaller(large);
    xavo::bench::Verdicts v;
    const std::string versus = std::to_string(big >> 20) + " MiB caller against a small one";
    v.Report("ORLICExec from a " + versus, stats[0].median / stats[1].median, 1.2);
    v.Report("ORLICPopen from a " + versus, stats[2].median / stats[3].median, 1.2);
    return v.ExitCode();
}

}  // namespace

int main(int argc, char **argv) {
    const xavo::bench::Options o = xavo::bench::ParseOptions(argc, argv, 15);
    return xavo::bench::Main([&] { return Run(o); });
}
