// Running programs: ORLICExec, ORLICExecl, ORLICExecv, ORLICPopen and
// ORLICPclose, and the process lookup of ORLICIsProcAlive.
//
// Programs are started with posix_spawn, never through a shell, so that no
// text handed to us (printer names, addresses, serial numbers) is ever
// interpreted.  Every child:
// - reads its standard input from /dev/null (nothing of the caller's);
// - inherits no descriptor of the caller's other than 1 and 2 (all others
//   are closed in the child, whatever their close-on-exec flag);
// - runs with an environment of PATH and LC_ALL=C only: the output the
//   printer library parses must not change with the caller's locale, and
//   nothing else of the caller's environment (LD_PRELOAD...) reaches tools
//   that run as root;
// - starts with default signal handling and an empty signal mask, whatever
//   the caller ignores or blocks (daemons ignore SIGPIPE, which would keep
//   a tool writing into a closed pipe alive);
// - is always waited for, also when the caller ignores SIGCHLD (see
//   ChildSignalScope).
//
// Results: the program's exit status (0 when it succeeded, 1 to 255 when it
// ran and failed), 128 + N when signal N killed it (as a shell reports it),
// and -1 with the last error set when it could not be started or waited
// for.  Every non-zero result sets the last error (ERR_EXEC).
#include <dirent.h>
#include <fcntl.h>
#include <glob.h>
#include <pthread.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "common/fd.h"
#include "common/text_files.h"
#include "core/internal.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "process";

constexpr char kDevNull[] = "/dev/null";
constexpr char kDefaultPath[] = "/usr/sbin:/usr/bin:/sbin:/bin";
constexpr char kLocale[] = "LC_ALL=C";
// Bounds the argument lists read from a variadic call, so that a caller
// that forgot the closing NULL fails instead of reading the stack forever.
constexpr size_t kMaxArgs = 256;
constexpr int32_t kNotRun = -1;
constexpr int32_t kSignalBase = 128;

// ORLICExecl's option word.  0x01: wait for the program and return its
// result (without it the program is started, 0 returned, and the program
// reaped in the background).  0x02: the program's standard output goes to
// /dev/null.  Other bits are reserved and ignored (0xBB = wait, discard
// output, plus reserved bits).
constexpr uint32_t kExeclWait = 0x01;
constexpr uint32_t kExeclQuiet = 0x02;

// ---- SIGCHLD ------------------------------------------------------------
//
// A host that ignores SIGCHLD (or sets SA_NOCLDWAIT) has its children reaped
// by the kernel the moment they exit, and waitpid() then fails with ECHILD:
// we could not tell a program's success from its failure.  While any child
// of ours runs, SIGCHLD is therefore set back to SIG_DFL, and the host's
// setting restored when the last one has been waited for.
//
// The trade-off: the disposition is the process's, not ours.  Children the
// host starts itself while the window is open are not reaped by the kernel;
// we reap them (they are already zombies, WNOHANG) when we restore the
// setting, which is what the host's SIG_IGN asked for.  A host that changes
// SIGCHLD itself while our window is open has its change undone.  A host
// that catches SIGCHLD and reaps every child with waitpid(-1) can still take
// our child's status first; the run then reports -1 (ERR_EXEC).
std::mutex gSignalMutex;
int gSignalUsers = 0;
bool gSignalChanged = false;
struct sigaction gSignalSaved {};

void AcquireChildSignal() {
    std::lock_guard guard(gSignalMutex);
    if (gSignalUsers++ > 0) return;
    struct sigaction current {};
    if (sigaction(SIGCHLD, nullptr, &current) != 0) return;
    if (current.sa_handler != SIG_IGN && (current.sa_flags & SA_NOCLDWAIT) == 0) return;
    struct sigaction dfl {};
    dfl.sa_handler = SIG_DFL;
    sigemptyset(&dfl.sa_mask);
    if (sigaction(SIGCHLD, &dfl, nullptr) == 0) {
        gSignalSaved = current;
        gSignalChanged = true;
    }
}

void ReleaseChildSignal() {
    std::lock_guard guard(gSignalMutex);
    if (--gSignalUsers > 0 || !gSignalChanged) return;
    sigaction(SIGCHLD, &gSignalSaved, nullptr);
    gSignalChanged = false;
    siginfo_t info{};
    while (waitid(P_ALL, 0, &info, WEXITED | WNOHANG) == 0 && info.si_pid != 0) info = siginfo_t{};
}

// Holds the SIGCHLD window open for one child, from before it is started
// until it has been waited for.
class ChildSignalScope {
public:
    ChildSignalScope() { AcquireChildSignal(); }
    ChildSignalScope(const ChildSignalScope &) = delete;
    ChildSignalScope &operator=(const ChildSignalScope &) = delete;
    ~ChildSignalScope() {
        if (held_) ReleaseChildSignal();
    }
    // The child outlives this scope (a stream, a background reaper), which
    // releases the window itself.
    void Keep() { held_ = false; }

private:
    bool held_ = true;
};

// ---- spawning -------------------------------------------------------------

enum class Stdout { kInherit, kDiscard, kPipe };

struct SpawnActions {
    posix_spawn_file_actions_t actions;
    posix_spawnattr_t attr;
    bool ok = false;
    SpawnActions() {
        bool a = posix_spawn_file_actions_init(&actions) == 0;
        bool b = posix_spawnattr_init(&attr) == 0;
        ok = a && b;
        if (a && !b) posix_spawn_file_actions_destroy(&actions);
        if (b && !a) posix_spawnattr_destroy(&attr);
    }
    SpawnActions(const SpawnActions &) = delete;
    SpawnActions &operator=(const SpawnActions &) = delete;
    ~SpawnActions() {
        if (ok) {
            posix_spawn_file_actions_destroy(&actions);
            posix_spawnattr_destroy(&attr);
        }
    }
};

bool IsOpen(int fd) { return fcntl(fd, F_GETFD) != -1 || errno != EBADF; }

std::vector<std::string> ChildEnvironment() {
    const char *path = std::getenv("PATH");
    return {std::string("PATH=") + (path != nullptr && path[0] != '\0' ? path : kDefaultPath), kLocale};
}

// Starts szProgram with argv (argv[0] first).  0 with *pPid set, or the
// error number (posix_spawn reports a program that cannot be executed here,
// not through a child that exits at once).
int Spawn(const char *szProgram, const std::vector<std::string> &argv, Stdout out, int fdPipeWrite, pid_t *pPid) {
    SpawnActions sa;
    if (!sa.ok) return ENOMEM;
    posix_spawn_file_actions_t *fa = &sa.actions;
    int err = posix_spawn_file_actions_addopen(fa, 0, kDevNull, O_RDONLY, 0);
    if (err == 0 && out == Stdout::kPipe) err = posix_spawn_file_actions_adddup2(fa, fdPipeWrite, 1);
    // A daemon may run with 1 or 2 closed: the child then gets /dev/null
    // there, or the first file it opens would receive its output.
    if (err == 0 && (out == Stdout::kDiscard || (out == Stdout::kInherit && !IsOpen(1)))) {
        err = posix_spawn_file_actions_addopen(fa, 1, kDevNull, O_WRONLY, 0);
    }
    if (err == 0 && !IsOpen(2)) err = posix_spawn_file_actions_addopen(fa, 2, kDevNull, O_WRONLY, 0);
    // Closes every other descriptor in the child, also those another thread
    // of the caller opened without close-on-exec a moment ago.
    if (err == 0) err = posix_spawn_file_actions_addclosefrom_np(fa, 3);

    sigset_t all, none;
    sigfillset(&all);
    sigemptyset(&none);
    if (err == 0) err = posix_spawnattr_setsigdefault(&sa.attr, &all);
    if (err == 0) err = posix_spawnattr_setsigmask(&sa.attr, &none);
    if (err == 0) err = posix_spawnattr_setflags(&sa.attr, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
    if (err != 0) return err;

    std::vector<char *> args;
    for (const std::string &a : argv) args.push_back(const_cast<char *>(a.c_str()));
    args.push_back(nullptr);
    std::vector<std::string> env = ChildEnvironment();
    std::vector<char *> envp;
    for (const std::string &e : env) envp.push_back(const_cast<char *>(e.c_str()));
    envp.push_back(nullptr);
    return posix_spawn(pPid, szProgram, fa, &sa.attr, args.data(), envp.data());
}

// The run's result from a wait status (see the top of this file), or kNotRun
// when the child cannot be waited for.
int32_t WaitFor(pid_t pid) {
    int status = 0;
    pid_t r;
    do {
        r = waitpid(pid, &status, 0);
    } while (r < 0 && errno == EINTR);
    if (r != pid) return kNotRun;
    if (WIFEXITED(status)) return WEXITSTATUS(status);
    if (WIFSIGNALED(status)) return kSignalBase + WTERMSIG(status);
    return kNotRun;
}

// Waits for a child nobody waits for, without holding up the caller.
void ReapInBackground(pid_t pid) {
    try {
        std::thread([pid] {
            WaitFor(pid);
            ReleaseChildSignal();
        }).detach();
    } catch (...) {
        WaitFor(pid);
        ReleaseChildSignal();
    }
}

// Runs a program; with bWait its result, else 0 once started.
int32_t Run(const char *szProgram, const std::vector<std::string> &argv, Stdout out, bool bWait, Failure *pFailure) {
    ChildSignalScope window;
    pid_t pid = -1;
    int err = Spawn(szProgram, argv, out, -1, &pid);
    if (err != 0) {
        errno = err;
        *pFailure = {kErrExec, __LINE__};
        return kNotRun;
    }
    if (!bWait) {
        window.Keep();
        ReapInBackground(pid);
        return 0;
    }
    int32_t result = WaitFor(pid);
    if (result != 0) *pFailure = {kErrExec, __LINE__};
    return result;
}

int32_t Report(int32_t result, const Failure &failure) {
    if (result != 0) SetError(failure.code, kUnit, failure.line);
    return result;
}

// Arguments after a fixed one, up to the closing NULL, read before any
// allocation (va_arg cannot be used inside the guarded body).
struct VarArgs {
    const char *args[kMaxArgs];
    size_t count = 0;

    // The program's argument vector: the program, then these arguments.
    std::vector<std::string> Argv(const char *szProgram) const {
        std::vector<std::string> argv{szProgram};
        argv.insert(argv.end(), args, args + count);
        return argv;
    }
};

// False when the list has no closing NULL within kMaxArgs.
bool CollectArgs(va_list ap, VarArgs *pArgs) {
    for (pArgs->count = 0; pArgs->count < kMaxArgs; ++pArgs->count) {
        const char *arg = va_arg(ap, const char *);
        if (arg == nullptr) return true;
        pArgs->args[pArgs->count] = arg;
    }
    return va_arg(ap, const char *) == nullptr;
}

// ORLICExec expands an argument as a file name pattern when it is an
// absolute path holding a pattern character (the spool cleaning removes
// "/var/services/printer/*.*").  Nothing else is ever expanded, and a file
// whose very name holds such characters is taken as it is.  A pattern that
// matches nothing is passed on unchanged, as a shell would.
void ExpandArgument(const char *szArg, std::vector<std::string> *pArgv) {
    std::string_view arg(szArg);
    struct stat st {};
    if (arg.empty() || arg.front() != '/' || arg.find_first_of("*?[") == std::string_view::npos ||
        ::lstat(szArg, &st) == 0) {
        pArgv->emplace_back(arg);
        return;
    }
    glob_t g{};
    if (::glob(szArg, 0, nullptr, &g) == 0) {
        try {
            for (size_t i = 0; i < g.gl_pathc; ++i) pArgv->emplace_back(g.gl_pathv[i]);
        } catch (...) {
            ::globfree(&g);
            throw;
        }
    } else {
        pArgv->emplace_back(arg);
    }
    ::globfree(&g);
}

// ---- streams of ORLICPopen --------------------------------------------------

struct Streams {
    std::mutex mutex;
    std::map<FILE *, pid_t> children;
};
Streams &OpenStreams();

// A child forked by the host has none of its parent's programs for
// children: it forgets their streams (ORLICPclose could not wait for them)
// and the SIGCHLD window they held open.
void BeforeFork() {
    OpenStreams().mutex.lock();
    gSignalMutex.lock();
}
void AfterForkParent() {
    gSignalMutex.unlock();
    OpenStreams().mutex.unlock();
}
void AfterForkChild() {
    if (gSignalChanged) sigaction(SIGCHLD, &gSignalSaved, nullptr);
    gSignalChanged = false;
    gSignalUsers = 0;
    gSignalMutex.unlock();
    OpenStreams().children.clear();
    OpenStreams().mutex.unlock();
}

Streams &OpenStreams() {
    static Streams *streams = [] {
        static Streams s;
        pthread_atfork(BeforeFork, AfterForkParent, AfterForkChild);
        return &s;
    }();
    return *streams;
}
// Registered when the library is loaded, before the host can fork.
[[maybe_unused]] const bool kForkHandlers = (OpenStreams(), true);

bool IsDigits(const char *sz) {
    if (*sz == '\0') return false;
    for (; *sz != '\0'; ++sz) {
        if (*sz < '0' || *sz > '9') return false;
    }
    return true;
}

}  // namespace

namespace xavo::core {

int32_t RunAndWait(const char *szProgram, const std::vector<std::string> &argv, Failure *pFailure) {
    return Run(szProgram, argv, Stdout::kInherit, true, pFailure);
}

bool ProcessAlive(std::string_view name) {
    // The kernel keeps 15 characters of a command name.
    constexpr size_t kCommLen = 15;
    name = name.substr(0, kCommLen);
    // A service counts as running for the caller only when it works on the
    // caller's files: a daemon in another mount namespace (a container, a
    // test sandbox) keeps its own /etc/cups and its own spool, and is no
    // use to us.
    // Looking through /proc meets processes we may not inspect (EACCES):
    // that is no failure of ours, and the caller's errno is left alone.
    const int savedErrno = errno;
    struct stat ownMounts {};
    const bool bKnowOwnMounts = ::stat("/proc/self/ns/mnt", &ownMounts) == 0;
    DIR *proc = ::opendir("/proc");
    if (proc == nullptr) return false;
    bool bFound = false;
    std::string stat;
    while (!bFound) {
        dirent *e = ::readdir(proc);
        if (e == nullptr) break;
        if (!IsDigits(e->d_name)) continue;
        if (bKnowOwnMounts) {
            struct stat mounts {};
            std::string ns = std::string("/proc/") + e->d_name + "/ns/mnt";
            if (::stat(ns.c_str(), &mounts) != 0 || mounts.st_ino != ownMounts.st_ino ||
                mounts.st_dev != ownMounts.st_dev) {
                continue;
            }
        }
        std::string path = std::string("/proc/") + e->d_name + "/stat";
        if (xavo::platform::ReadTextFile(path.c_str(), &stat) != ReadResult::kOk) continue;
        // "pid (comm) state ...": the name may hold ")" itself, so it ends
        // at the last one.
        size_t open = stat.find('(');
        size_t close = stat.rfind(')');
        if (open == std::string::npos || close == std::string::npos || close < open || close + 2 >= stat.size()) {
            continue;
        }
        char state = stat[close + 2];
        bFound = std::string_view(stat).substr(open + 1, close - open - 1) == name && state != 'Z' && state != 'X';
    }
    ::closedir(proc);
    errno = savedErrno;
    return bFound;
}

}  // namespace xavo::core

XAVO_PLATFORM_API int32_t ORLICExec(const char *szProgram, const char *szArg1, const char *szArg2,
                                    const char *szArg3, const char *szArg4) {
    if (XAVO_INJECTED()) return kNotRun;
    if (szProgram == nullptr || szProgram[0] == '\0') {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        std::vector<std::string> argv{szProgram};
        // The first null slot ends the arguments.
        for (const char *arg : {szArg1, szArg2, szArg3, szArg4}) {
            if (arg == nullptr) break;
            ExpandArgument(arg, &argv);
        }
        Failure failure;
        return Report(Run(szProgram, argv, Stdout::kInherit, true, &failure), failure);
    });
}

XAVO_PLATFORM_API int32_t ORLICExecl(const char *szProgram, uint32_t uOptions, ...) {
    if (XAVO_INJECTED()) return kNotRun;
    VarArgs args;
    va_list ap;
    va_start(ap, uOptions);
    bool bArgsOk = CollectArgs(ap, &args);
    va_end(ap);
    if (szProgram == nullptr || szProgram[0] == '\0' || !bArgsOk) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        Failure failure;
        Stdout out = (uOptions & kExeclQuiet) != 0 ? Stdout::kDiscard : Stdout::kInherit;
        return Report(Run(szProgram, args.Argv(szProgram), out, (uOptions & kExeclWait) != 0, &failure), failure);
    });
}

XAVO_PLATFORM_API int32_t ORLICExecv(const char *szProgram, char *const apszArgv[], int32_t blWait) {
    if (XAVO_INJECTED()) return kNotRun;
    if (szProgram == nullptr || szProgram[0] == '\0' || apszArgv == nullptr || apszArgv[0] == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        std::vector<std::string> argv;
        for (size_t i = 0; apszArgv[i] != nullptr; ++i) {
            if (i == kMaxArgs) {
                SetError(kErrBadParameters, kUnit, __LINE__);
                return kNotRun;
            }
            argv.emplace_back(apszArgv[i]);
        }
        Failure failure;
        return Report(Run(szProgram, argv, Stdout::kInherit, blWait != 0, &failure), failure);
    });
}

XAVO_PLATFORM_API FILE *ORLICPopen(const char *szProgram, const char *szMode, ...) {
    if (XAVO_INJECTED()) return nullptr;
    VarArgs args;
    va_list ap;
    va_start(ap, szMode);
    bool bArgsOk = CollectArgs(ap, &args);
    va_end(ap);
    // Only reading a program's output is offered; nothing of the appliance
    // writes into a program.
    if (szProgram == nullptr || szProgram[0] == '\0' || szMode == nullptr || std::strcmp(szMode, "r") != 0 ||
        !bArgsOk) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return nullptr;
    }
    return XAVO_GUARD(static_cast<FILE *>(nullptr), [&]() -> FILE * {
        const std::vector<std::string> argv = args.Argv(szProgram);
        Streams &streams = OpenStreams();
        std::lock_guard guard(streams.mutex);
        auto [slot, bNew] = streams.children.try_emplace(nullptr, -1);
        // The slot exists before the child does, so that no child is ever
        // started that Pclose could not find.
        struct SlotGuard {
            Streams &s;
            std::map<FILE *, pid_t>::iterator it;
            bool keep = false;
            ~SlotGuard() {
                if (!keep) s.children.erase(it);
            }
        } slotGuard{streams, slot};
        if (!bNew) return nullptr;  // cannot happen: nullptr is never kept

        int ends[2];
        if (::pipe2(ends, O_CLOEXEC) != 0) {
            SetError(kErrOpen, kUnit, __LINE__);
            return nullptr;
        }
        Fd readEnd(ends[0]), writeEnd(ends[1]);
        // Keep both ends off 0, 1 and 2 (a daemon may have closed those), so
        // that the child's dup2() onto 1 always moves the write end.
        for (Fd *end : {&readEnd, &writeEnd}) {
            if (end->get() <= 2) {
                int moved = ::fcntl(end->get(), F_DUPFD_CLOEXEC, 3);
                if (moved < 0) {
                    SetError(kErrOpen, kUnit, __LINE__);
                    return nullptr;
                }
                end->reset(moved);
            }
        }
        ChildSignalScope window;
        pid_t pid = -1;
        int err = Spawn(szProgram, argv, Stdout::kPipe, writeEnd.get(), &pid);
        if (err != 0) {
            errno = err;
            SetError(kErrExec, kUnit, __LINE__);
            return nullptr;
        }
        writeEnd.reset();
        FILE *pStream = ::fdopen(readEnd.get(), "r");
        if (pStream == nullptr) {
            int saved = errno;
            readEnd.reset();
            WaitFor(pid);
            errno = saved;
            SetError(kErrOpen, kUnit, __LINE__);
            return nullptr;
        }
        readEnd.release();
        // Re-keyed without allocating: the node moves from nullptr to the
        // stream.
        auto node = streams.children.extract(slot);
        node.key() = pStream;
        node.mapped() = pid;
        streams.children.insert(std::move(node));
        slotGuard.keep = true;
        window.Keep();
        return pStream;
    });
}

// Closes the stream and waits for its program: the program's result (see
// the top of this file), or -1 when the stream is not one of ORLICPopen's or
// the program cannot be waited for.  A close that a test makes fail still
// closes and waits: the failure is only reported.
XAVO_PLATFORM_API int32_t ORLICPclose(FILE *pStream) {
    uint32_t uInjected = 0;
    bool bInjected = XavoStandinEnter(__func__, 1, &uInjected) != 0;
    pid_t pid = -1;
    {
        Streams &streams = OpenStreams();
        std::lock_guard guard(streams.mutex);
        auto it = pStream != nullptr ? streams.children.find(pStream) : streams.children.end();
        if (it == streams.children.end()) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return kNotRun;
        }
        pid = it->second;
        streams.children.erase(it);
    }
    // Closing first: a program still writing gets EPIPE (or SIGPIPE) and
    // ends instead of blocking on a pipe nobody reads.
    std::fclose(pStream);
    int32_t result = WaitFor(pid);
    ReleaseChildSignal();
    if (result != 0) SetError(kErrExec, kUnit, __LINE__);
    if (bInjected) {
        SetError(uInjected, kUnit, __LINE__);
        return kNotRun;
    }
    return result;
}

XAVO_PLATFORM_API int32_t ORLICIsProcAlive(const char *szProcName) {
    Counted(__func__);
    if (szProcName == nullptr || szProcName[0] == '\0') return 0;
    return XAVO_GUARD(int32_t{0}, [&] { return xavo::core::ProcessAlive(szProcName) ? int32_t{1} : int32_t{0}; });
}
