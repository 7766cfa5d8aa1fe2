// xavo-sandbox-run: runs one command inside a fresh appliance sandbox and
// exits with its status.  For checks that must change the system the way
// an install does (dpkg -i into /usr, /etc and /var, ldconfig) without
// touching the host: the writes land in the sandbox's throwaway layers.
//
//   xavo-sandbox-run COMMAND [ARG...]
//
// Everything the command leaves running is stopped by its id before the
// sandbox goes.
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace {

// Exit statuses of the runner itself, as a shell reports them.
constexpr int kUsage = 2;
constexpr int kCannotRun = 127;
constexpr int kSignalBase = 128;

int StatusOf(int wstatus) {
    if (WIFEXITED(wstatus)) return WEXITSTATUS(wstatus);
    if (WIFSIGNALED(wstatus)) return kSignalBase + WTERMSIG(wstatus);
    return kCannotRun;
}

}  // namespace

int main(int argc, char **argv) {
    if (argc < 2) {
        std::fprintf(stderr, "usage: xavo-sandbox-run COMMAND [ARG...]\n");
        return kUsage;
    }
    // Entered while single-threaded: unshare() refuses a threaded process.
    xavo::test::EnterSandbox();
    const pid_t pid = fork();
    if (pid < 0) {
        std::perror("xavo-sandbox-run: fork");
        return kCannotRun;
    }
    if (pid == 0) {
        execvp(argv[1], argv + 1);
        const int err = errno;
        std::fprintf(stderr, "xavo-sandbox-run: %s: %s\n", argv[1], std::strerror(err));
        _exit(kCannotRun);
    }
    int wstatus = 0;
    pid_t got = -1;
    do {
        got = waitpid(pid, &wstatus, 0);
    } while (got < 0 && errno == EINTR);
    xavo::test::detail::StopLeftovers();
    return got == pid ? StatusOf(wstatus) : kCannotRun;
}
