// Starting a program (Child::Start).
//
// A caller may catch SIGCHLD and reap every child with waitpid(-1), or
// ignore SIGCHLD so that the kernel reaps its children: either would take a
// program's exit status before the runner reads it, and a run that
// succeeded would be reported failed.  Changing the caller's SIGCHLD
// setting for the time of a run races with the caller's own code.  So the
// program is never a child of the caller.  The runner starts a helper with
// clone(CLONE_VM) and no exit signal; the helper starts the program the way
// vfork does (clone(CLONE_VM | CLONE_VFORK)), waits for it and exits with
// its status.  The helper never calls exec, so it stays a child that sends
// no signal when it ends: waitpid(-1) without __WALL or __WCLONE never
// takes it, SIG_IGN and SA_NOCLDWAIT do not reap it, and the caller's
// handler is never woken by the runner.  (Starting the program itself that
// way would not do: exec makes every process a SIGCHLD child again.)  The
// runner reaps the helper with __WALL.  A run is reported failed only from
// the program's own status, or when the helper was taken by a caller that
// reaps with __WALL itself or killed from outside: then the runner cannot
// know, and says so with kNotRun.
//
// Sharing the caller's memory keeps a start from a service with gigabytes
// resident as cheap as from a small one: no page table is copied.  The
// price: the helper and the program (until its exec) run on stacks of their
// own in the caller's memory and with the calling thread's thread-local
// storage.  So they make raw system calls only (no allocation, lock or
// sanitizer hook), start with every signal blocked, put every disposition
// back to the default before the program unblocks any, and touch errno
// only while the calling thread waits for the start to be reported (it then
// sets errno itself).  Past that point the helper makes only calls that
// cannot fail.
#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <new>

#include "core/process_child.h"

using xavo::platform::Fd;

namespace {

constexpr char kDevNull[] = "/dev/null";
constexpr char kDefaultPath[] = "/usr/sbin:/usr/bin:/sbin:/bin";
constexpr char kLocale[] = "LC_ALL=C";
constexpr size_t kStackSize = 64 * 1024;
// Where close_range() is missing (kernels before 5.9), descriptors are
// closed one by one up to this.
constexpr unsigned kMaxFdFallback = 65536;

// The kernel's own sigaction record of rt_sigaction(), the same on i386
// and x86_64; 8 bytes of signal set.
struct KernelSigaction {
    void (*handler)(int);
    unsigned long flags;
    void (*restorer)();
    uint32_t mask[2];
};
constexpr unsigned long kKernelSigsetSize = 8;
constexpr int kLastSignal = 64;

// Everything the helper and the program use, in the block they share with
// the runner (never on the runner's stack: a stream's helper outlives the
// call that started it).
struct Launch {
    const char *szPath;
    char *const *argv;
    char *const *envp;
    int fdIn, fdOut, fdErr;  // become 0, 1 and 2 (fdOut -1: the caller's 1 stays)
    int fdReport, fdGo;      // the helper's ends of its two pipes
    char *pProgramStack;     // top of the program's stack
    pid_t program;           // set by the helper before it reports
    int execError;           // set when the program could not be started
};

#define XAVO_RAW_CHILD __attribute__((no_sanitize("address", "undefined"), noinline))

XAVO_RAW_CHILD void CloseRange(unsigned lo, unsigned hi) {
    if (lo > hi || syscall(SYS_close_range, lo, hi, 0) == 0) return;
    for (unsigned fd = lo; fd <= hi && fd < kMaxFdFallback; ++fd) syscall(SYS_close, fd);
}

// The program: a process group of its own, so that at its time limit it is
// stopped together with whatever it started; only 0, 1 and 2; no blocked
// signal (the helper reset every disposition first, so nothing of the
// caller's runs here).
XAVO_RAW_CHILD int ProgramMain(void *pArg) {
    Launch *l = static_cast<Launch *>(pArg);
    syscall(SYS_setpgid, 0, 0);
    CloseRange(3, ~0U);
    const uint32_t none[2] = {0, 0};
    syscall(SYS_rt_sigprocmask, SIG_SETMASK, none, nullptr, kKernelSigsetSize);
    syscall(SYS_execve, l->szPath, l->argv, l->envp);
    l->execError = errno;
    syscall(SYS_exit_group, 127);
    return 127;
}

XAVO_RAW_CHILD bool SetUpStdio(const Launch *l) {
    return syscall(SYS_dup3, l->fdIn, 0, 0) == 0 && (l->fdOut < 0 || syscall(SYS_dup3, l->fdOut, 1, 0) == 1) &&
           syscall(SYS_dup3, l->fdErr, 2, 0) == 2;
}

XAVO_RAW_CHILD int HelperMain(void *pArg) {
    Launch *l = static_cast<Launch *>(pArg);
    const KernelSigaction dfl{SIG_DFL, 0, nullptr, {0, 0}};
    for (int sig = 1; sig <= kLastSignal; ++sig) {
        if (sig != SIGKILL && sig != SIGSTOP) syscall(SYS_rt_sigaction, sig, &dfl, nullptr, kKernelSigsetSize);
    }
    pid_t program = -1;
    if (SetUpStdio(l)) {
        // No descriptor of the caller's stays open here either: a pipe's
        // reader must see its end when the caller closes its side.
        const unsigned lo = static_cast<unsigned>(l->fdReport < l->fdGo ? l->fdReport : l->fdGo);
        const unsigned hi = static_cast<unsigned>(l->fdReport < l->fdGo ? l->fdGo : l->fdReport);
        CloseRange(3, lo - 1);
        CloseRange(lo + 1, hi - 1);
        CloseRange(hi + 1, ~0U);
        program = clone(ProgramMain, l->pProgramStack, CLONE_VM | CLONE_VFORK | SIGCHLD, l);
    }
    if (program < 0) l->execError = errno;
    // The program has its own copies: the ends of its output pipes must
    // show when the program (and what it started) closes them.
    CloseRange(0, 2);
    l->program = program;
    char note = xavo::core::kNoteStarted;
    syscall(SYS_write, l->fdReport, &note, 1);
    if (program < 0) syscall(SYS_exit_group, 127);
    // The ended program stays a zombie until the runner releases it, so
    // that its process group cannot be reused while the runner may still
    // signal it.
    siginfo_t info;
    syscall(SYS_waitid, P_PID, program, &info, WEXITED | WNOWAIT, nullptr);
    note = xavo::core::kNoteEnded;
    syscall(SYS_write, l->fdReport, &note, 1);
    syscall(SYS_read, l->fdGo, &note, 1);
    int status = 0;
    syscall(SYS_wait4, program, &status, 0, nullptr);
    syscall(SYS_exit_group, WIFEXITED(status) ? WEXITSTATUS(status) : xavo::core::kSignalBase + WTERMSIG(status));
    return 0;
}

bool IsOpen(int fd) { return fcntl(fd, F_GETFD) != -1 || errno != EBADF; }

// Keeps a descriptor off 0, 1 and 2 (a daemon may have closed those), so
// that the helper's dup3() onto them never replaces one of its sources.
bool MoveAbove2(Fd *pFd) {
    if (pFd->get() < 0) return false;
    if (pFd->get() > 2) return true;
    const int moved = fcntl(pFd->get(), F_DUPFD_CLOEXEC, 3);
    pFd->reset(moved);
    return moved >= 0;
}

bool OpenNull(int flags, Fd *pFd) {
    pFd->reset(::open(kDevNull, flags | O_CLOEXEC));
    return MoveAbove2(pFd);
}

bool OpenPipe(Fd *pRead, Fd *pWrite, bool bReadNonBlocking) {
    int ends[2];
    if (::pipe2(ends, O_CLOEXEC) != 0) return false;
    pRead->reset(ends[0]);
    pWrite->reset(ends[1]);
    if (bReadNonBlocking && ::fcntl(pRead->get(), F_SETFL, O_NONBLOCK) != 0) return false;
    return MoveAbove2(pRead) && MoveAbove2(pWrite);
}

// PATH and LC_ALL=C only: the output the printer library parses must not
// change with the caller's locale, and nothing else of the caller's
// environment (LD_PRELOAD...) reaches tools that run as root.
std::vector<std::string> ChildEnvironment() {
    const char *path = std::getenv("PATH");
    return {std::string("PATH=") + (path != nullptr && path[0] != '\0' ? path : kDefaultPath), kLocale};
}

std::vector<char *> Pointers(const std::vector<std::string> &texts) {
    std::vector<char *> out;
    for (const std::string &t : texts) out.push_back(const_cast<char *>(t.c_str()));
    out.push_back(nullptr);
    return out;
}

}  // namespace

namespace xavo::core {

std::unique_ptr<Child> Child::Start(const char *szProgram, const std::vector<std::string> &argv, Stdout out) {
    std::unique_ptr<Child> child(new Child(szProgram));
    const int saved = errno;
    if (!child->Launched(szProgram, argv, out)) return nullptr;
    errno = saved;
    return child;
}

// The program's ends of its pipes and /dev/null, kept by the caller until
// the helper has its copies.
struct Child::ChildEnds {
    Fd in, out, err, report, go;
};

bool Child::OpenEnds(Stdout out, ChildEnds *pEnds) {
    if (!OpenNull(O_RDONLY, &pEnds->in)) return false;
    if (out == Stdout::kPipe ? !OpenPipe(&out_, &pEnds->out, true)
                             : (out == Stdout::kDiscard || !IsOpen(1)) && !OpenNull(O_WRONLY, &pEnds->out)) {
        return false;
    }
    return OpenPipe(&err_, &pEnds->err, true) && OpenPipe(&report_, &pEnds->report, false) &&
           OpenPipe(&pEnds->go, &go_, false);
}

// [Launch][guard][helper's stack][guard][program's stack]: the guard pages
// turn an overflow into a fault instead of a write into the other.
bool Child::MapBlock() {
    const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    cbBlock_ = 3 * page + 2 * kStackSize;
    void *pBlock = mmap(nullptr, cbBlock_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_STACK, -1, 0);
    if (pBlock == MAP_FAILED) return false;
    pBlock_ = pBlock;
    char *base = static_cast<char *>(pBlock);
    pHelperStack_ = base + 2 * page + kStackSize;
    return mprotect(base + page, page, PROT_NONE) == 0 && mprotect(pHelperStack_, page, PROT_NONE) == 0;
}

bool Child::Launched(const char *szProgram, const std::vector<std::string> &argv, Stdout out) {
    const Clock::time_point start = Clock::now();
    const std::vector<char *> args = Pointers(argv);
    const std::vector<std::string> env = ChildEnvironment();
    const std::vector<char *> envp = Pointers(env);
    ChildEnds ends;
    if (!OpenEnds(out, &ends) || !MapBlock()) return false;
    char *base = static_cast<char *>(pBlock_);
    Launch *l = new (base) Launch{szProgram, args.data(), envp.data(), ends.in.get(), ends.out.get(), ends.err.get(),
                                  ends.report.get(), ends.go.get(), base + cbBlock_, -1, 0};
    sigset_t all, old;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &old);
    helper_ = clone(HelperMain, pHelperStack_, CLONE_VM, l);
    const int cloneError = errno;
    pthread_sigmask(SIG_SETMASK, &old, nullptr);
    if (helper_ < 0) {
        errno = cloneError;
        return false;
    }
    // The helper has its own copies; without ours, its end shows as the
    // end of the pipe.
    ends.report.reset();
    char note = 0;
    ssize_t n;
    do {
        n = ::read(report_.get(), &note, 1);
    } while (n < 0 && errno == EINTR);
    program_ = n == 1 ? l->program : -1;
    const int startError = n == 1 ? l->execError : ECHILD;
    if (program_ > 0 && startError == 0) {
        deadline_ = start + ToolTimeLimit(szProgram);
        return true;
    }
    // The program ended at once (or never started): nothing to stop.
    AwaitExit(Clock::time_point::max());
    Finish();
    errno = startError != 0 ? startError : ECHILD;
    return false;
}

}  // namespace xavo::core
