// Waiting for a started program: never past its time limit, relaying its
// standard error meanwhile, and without sleeping (poll() on the helper's
// pipe and the program's output, against a CLOCK_MONOTONIC deadline).
//
// Past the limit the program's process group gets SIGTERM, then SIGKILL
// after kStopGrace, and the run reports kNotRun: the caller's operation
// then follows its own rules for a failed run, or for a listing that ended.
#include <poll.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

#include "core/process_child.h"

namespace {

constexpr char kLogStopped[] = "no exit within its time limit, stopped";
constexpr size_t kReadChunk = 4096;
// What is still read of a program's standard error once it has ended
// (something it started may keep writing there).
constexpr size_t kMaxDrain = 256 * 1024;

// A signal handler of the caller without SA_RESTART would have made a
// plain read() fail with EINTR, which the printer library tells from the
// end of the output and counts; poll() fails with EINTR for every handler.
// So an interrupted wait is reported only when some handler asks for
// interruptions (signals that only a fault raises are left out).
bool EverySignalRestarts() {
    for (int sig = 1; sig < NSIG; ++sig) {
        if (sig == SIGSEGV || sig == SIGBUS || sig == SIGFPE || sig == SIGILL || sig == SIGTRAP) continue;
        struct sigaction sa {};
        if (sigaction(sig, nullptr, &sa) != 0 || sa.sa_handler == SIG_DFL || sa.sa_handler == SIG_IGN) continue;
        if ((sa.sa_flags & SA_RESTART) == 0) return false;
    }
    return true;
}

int PollMilliseconds(xavo::core::Clock::duration left) {
    using namespace std::chrono;
    const auto ms = duration_cast<milliseconds>(left + milliseconds(1) - nanoseconds(1)).count();
    return static_cast<int>(std::min<decltype(ms)>(ms, INT_MAX));
}

}  // namespace

namespace xavo::core {

Child::Child(const char *szProgram) : relay_(szProgram) {}

Child::~Child() {
    if (helper_ > 0 && !finished_) {
        if (!exited_) Stop();
        Finish();
    }
    if (pBlock_ != nullptr) munmap(pBlock_, cbBlock_);
}

int32_t Child::Wait() {
    if (!AwaitExit(deadline_)) Stop();
    return Finish();
}

bool Child::AwaitExit(Clock::time_point until) {
    while (!exited_) {
        if (WaitReadable(report_.get(), until, false) != Woken::kReady) return false;
        TakeExitNote();
    }
    return true;
}

ssize_t Child::ReadOutput(char *pBuf, size_t cb) {
    const int saved = errno;
    for (;;) {
        if (out_.get() < 0 || stopped_) {
            errno = saved;
            return 0;
        }
        const ssize_t n = ::read(out_.get(), pBuf, cb);
        if (n >= 0) {
            errno = saved;
            return n;
        }
        if (errno != EAGAIN && errno != EINTR) return -1;
        switch (WaitReadable(out_.get(), deadline_, true)) {
            case Woken::kReady:
                break;
            case Woken::kInterrupted:
                errno = EINTR;
                return -1;
            case Woken::kTimeUp:
                Stop();
                break;
        }
    }
}

Child::Woken Child::WaitReadable(int fd, Clock::time_point until, bool bInterruptible) {
    for (;;) {
        const Clock::duration left = until - Clock::now();
        if (left <= Clock::duration::zero()) return Woken::kTimeUp;
        pollfd fds[2] = {{fd, POLLIN, 0}, {err_.get(), POLLIN, 0}};
        const nfds_t count = err_.get() >= 0 ? 2 : 1;
        const int r = ::poll(fds, count, PollMilliseconds(left));
        if (r < 0 && errno == EINTR) {
            if (bInterruptible && !EverySignalRestarts()) return Woken::kInterrupted;
            continue;
        }
        // poll() fails otherwise only when the kernel is out of memory:
        // treated as the end of the wait, not as a wait for ever.
        if (r < 0) return Woken::kTimeUp;
        if (count == 2 && fds[1].revents != 0) RelayStderr();
        if (fds[0].revents != 0) return Woken::kReady;
    }
}

void Child::RelayStderr() {
    char buf[kReadChunk];
    const ssize_t n = ::read(err_.get(), buf, sizeof buf);
    if (n > 0) {
        relay_.Feed(buf, static_cast<size_t>(n));
    } else if (n == 0 || (errno != EAGAIN && errno != EINTR)) {
        err_.reset();
        relay_.Flush();
    }
}

void Child::DrainStderr() {
    for (size_t drained = 0; err_.get() >= 0 && drained < kMaxDrain; drained += kReadChunk) {
        char buf[kReadChunk];
        const ssize_t n = ::read(err_.get(), buf, sizeof buf);
        if (n <= 0) break;
        relay_.Feed(buf, static_cast<size_t>(n));
    }
    err_.reset();
    relay_.Flush();
}

void Child::TakeExitNote() {
    char note = 0;
    const ssize_t n = ::read(report_.get(), &note, 1);
    if (n < 0) return;  // EINTR: asked again
    exited_ = true;
    lost_ = n == 0 || note != kNoteEnded;
}

// The group and the program itself: a program may have moved to a group
// of its own.  Its number stays reserved while it is an unreaped zombie,
// which the helper keeps it as until Finish().
void Child::Signal(int sig) const {
    if (program_ <= 0) return;
    ::kill(-program_, sig);
    ::kill(program_, sig);
}

void Child::Stop() {
    const int saved = errno;
    relay_.Note(kLogStopped);
    stopped_ = true;
    Signal(SIGTERM);
    AwaitExit(Clock::now() + kStopGrace);
    // Also when the program went at SIGTERM: what it started goes too.
    Signal(SIGKILL);
    AwaitExit(Clock::time_point::max());
    errno = saved;
}

int32_t Child::Finish() {
    const int saved = errno;
    DrainStderr();
    out_.reset();
    finished_ = true;
    const char release = kNoteRelease;
    while (::write(go_.get(), &release, 1) < 0 && errno == EINTR) {
    }
    go_.reset();
    siginfo_t info{};
    int r;
    do {
        r = ::waitid(P_PID, static_cast<id_t>(helper_), &info, WEXITED | __WALL);
    } while (r < 0 && errno == EINTR);
    errno = saved;
    if (r != 0 || stopped_ || lost_ || info.si_code != CLD_EXITED) return kNotRun;
    return info.si_status;
}

}  // namespace xavo::core
