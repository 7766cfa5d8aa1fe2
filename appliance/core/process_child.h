// A program the runner started, owned from its start until it has been
// reaped.  Shared by the runner's units: process.cc (ORLICExec and
// friends), process_popen.cc (ORLICPopen/ORLICPclose) and the service
// starts; started in process_start.cc, waited for in process_wait.cc.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "common/fd.h"

namespace xavo::core {

// CLOCK_MONOTONIC: a changed wall clock neither cuts a run short nor
// lengthens it.
using Clock = std::chrono::steady_clock;

// Results of a run (see process.cc): the exit status (0 to 255), 128 + N
// when signal N ended the program, or kNotRun when it could not be started,
// was stopped at its time limit, or its end could not be learnt.
inline constexpr int32_t kNotRun = -1;
inline constexpr int32_t kSignalBase = 128;

enum class Stdout { kInherit, kDiscard, kPipe };

// The bytes the helper that runs a program (process_start.cc) and the
// runner send each other over their pipes.
inline constexpr char kNoteStarted = 's';  // helper: the program runs (or failed to start)
inline constexpr char kNoteEnded = 'x';    // helper: the program has ended
inline constexpr char kNoteRelease = 'g';  // runner: reap it and exit

// How long szProgram may run before it is stopped (process_limits.cc).
Clock::duration ToolTimeLimit(const char *szProgram);
// Between SIGTERM and SIGKILL for a program past its limit: long enough for
// a tool to remove its temporary files, short next to any limit.
inline constexpr std::chrono::seconds kStopGrace{2};

// What a program writes on its standard error goes to syslog at debug
// priority, one message per line, tagged with the program's name
// ("lpstat: No destinations added."), so that it lands beside the caller's
// own lines instead of on the caller's terminal (process_relay.cc).
class StderrRelay {
public:
    explicit StderrRelay(const char *szProgram);
    void Feed(const char *pData, size_t cb) noexcept;
    void Flush() noexcept;  // the last line, when it had no newline
    // A line of the runner's own about this program, in the same form.
    void Note(const char *szText) const noexcept;

private:
    void Emit(std::string_view line) const noexcept;
    std::string name_;
    std::string partial_;
};

class Child {
public:
    // Starts szProgram with argv (argv[0] first) and its time limit
    // running; null with errno set when it could not be started.
    static std::unique_ptr<Child> Start(const char *szProgram, const std::vector<std::string> &argv, Stdout out);
    Child(const Child &) = delete;
    Child &operator=(const Child &) = delete;
    // A child nobody waited for is stopped and reaped all the same.
    ~Child();

    // Waits until the program ends or its time is up (it is then stopped),
    // relaying its standard error; the run's result.  Once only.
    int32_t Wait();
    // ORLICPopen's stream: up to cb bytes of the program's standard output;
    // 0 at its end or once the time limit passed (the program is then
    // stopped); -1 with errno EINTR when a signal of the caller's that does
    // not restart reads interrupted the wait.
    ssize_t ReadOutput(char *pBuf, size_t cb);
    void CloseOutput() { out_.reset(); }

private:
    enum class Woken { kReady, kTimeUp, kInterrupted };
    struct ChildEnds;
    explicit Child(const char *szProgram);
    bool OpenEnds(Stdout out, ChildEnds *pEnds);
    bool MapBlock();
    bool Launched(const char *szProgram, const std::vector<std::string> &argv, Stdout out);
    Woken WaitReadable(int fd, Clock::time_point until, bool bInterruptible);
    // Takes the helper's notes until the program's end is known; false when
    // until passed first.
    bool AwaitExit(Clock::time_point until);
    void RelayStderr();
    void DrainStderr();
    void TakeExitNote();
    void Signal(int sig) const;
    void Stop();
    int32_t Finish();

    StderrRelay relay_;
    Clock::time_point deadline_;
    void *pBlock_ = nullptr;  // the Launch record and the stacks (mmap)
    size_t cbBlock_ = 0;
    char *pHelperStack_ = nullptr;  // top of the helper's stack, in the block
    pid_t helper_ = -1;
    pid_t program_ = -1;
    xavo::platform::Fd out_, err_, report_, go_;
    bool exited_ = false;    // the program has ended (the helper said so)
    bool stopped_ = false;   // ended by the runner at its time limit
    bool lost_ = false;      // the helper ended before it could tell
    bool finished_ = false;  // the helper is reaped
};

}  // namespace xavo::core
