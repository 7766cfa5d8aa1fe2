// Several processes of the appliance calling the library at the same time.
#pragma once

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "sandbox/sandbox.h"

namespace xavo::test {

// Whether body, run in a forked child, answered true (a child that did not
// exit normally answers false).
inline bool InChild(const std::function<bool()> &body) {
    const pid_t pid = fork();
    if (pid == 0) _exit(body() ? 0 : 1);
    int status = -1;
    return pid > 0 && waitpid(pid, &status, 0) == pid && WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

// Runs body(0) .. body(n - 1) in n forked processes that all start when
// the last one is forked, with real sleeps so that a lock try waits for its
// holder; each body answers whether its process did all it should.
inline void RunAtOnce(int n, const std::function<bool(int)> &body) {
    SetRealSleep(true);
    int go[2];
    ASSERT_EQ(pipe(go), 0);
    std::vector<pid_t> children;
    for (int i = 0; i < n; ++i) {
        const pid_t pid = fork();
        if (pid == 0) {
            close(go[1]);
            char c;
            (void)!read(go[0], &c, 1);  // returns when the parent closes its end
            _exit(body(i) ? 0 : 1);
        }
        EXPECT_GT(pid, 0) << "fork";
        if (pid > 0) children.push_back(pid);
    }
    close(go[0]);
    close(go[1]);
    for (pid_t pid : children) {
        int status = 0;
        EXPECT_EQ(waitpid(pid, &status, 0), pid);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << "process " << pid;
    }
}

// posix_spawn may return before the kernel gave the child the command name
// of its new program: waits (bounded) until it has it, so that a lookup of
// the process by name finds it.
inline void AwaitCommandName(pid_t pid, const std::string &name) {
    const std::string comm = "/proc/" + std::to_string(pid) + "/comm";
    for (int i = 0; pid > 0 && i < 400 && ReadFile(comm) != name + "\n"; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
}

// Whether a process of that id still runs (a zombie has ended).
inline bool Running(pid_t pid) {
    const std::string stat = ReadFile("/proc/" + std::to_string(pid) + "/stat");
    const size_t close = stat.rfind(')');
    return close != std::string::npos && close + 2 < stat.size() && stat[close + 2] != 'Z';
}

// A signal sent is taken a moment later: up to a second for the process to
// end.
inline bool EndsSoon(pid_t pid) {
    for (int i = 0; i < 100 && Running(pid); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(10));
    return !Running(pid);
}

// Nothing started in the sandbox is left, zombies included, once the
// orphans of stopped tools are reaped: those come to this process, the
// sandbox's subreaper, as they come to init on the appliance, and are
// reaped here as init would (up to a second for them to end).
inline bool NothingLeft() {
    for (int i = 0; i < 100; ++i) {
        for (const SandboxProcess &p : Descendants()) {
            if (p.state == 'Z') waitpid(p.pid, nullptr, WNOHANG);
        }
        if (Descendants().empty()) return true;
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return false;
}

// Catches sig without SA_RESTART for its lifetime, so that a read blocked
// when it arrives fails with EINTR.
class InterruptingSignal {
public:
    explicit InterruptingSignal(int sig) : sig_(sig) {
        struct sigaction sa {};
        sa.sa_handler = [](int) {};
        sigaction(sig, &sa, &old_);
    }
    InterruptingSignal(const InterruptingSignal &) = delete;
    InterruptingSignal &operator=(const InterruptingSignal &) = delete;
    ~InterruptingSignal() { sigaction(sig_, &old_, nullptr); }

private:
    int sig_;
    struct sigaction old_ {};
};

// The ways a service may handle SIGCHLD, which must never change what the
// platform's runs answer.
inline std::atomic<int> gReapingHandlerCalls{0};
inline void ReapEveryChild(int) {
    ++gReapingHandlerCalls;
    const int saved = errno;
    while (waitpid(-1, nullptr, WNOHANG) > 0) {
    }
    errno = saved;
}
struct SigchldSetting {
    const char *szName;
    void (*handler)(int);
    int flags;
    bool bBlocked;
};
inline const SigchldSetting kSigchldSettings[] = {
    {"SIGCHLD default", SIG_DFL, 0, false},
    {"SIGCHLD ignored", SIG_IGN, 0, false},
    {"reaping SIGCHLD handler", ReapEveryChild, SA_RESTART, false},
    {"reaping SIGCHLD handler without SA_RESTART", ReapEveryChild, 0, false},
    {"SIGCHLD blocked", SIG_DFL, 0, true},
};

// Holds a setting for its lifetime, with a child of the caller's own that
// ends a moment after the start, while the runs under test wait; reaped on
// the way out where the setting leaves that to the caller.
class SigchldScope {
public:
    explicit SigchldScope(const SigchldSetting &setting) : setting_(setting) {
        struct sigaction sa {};
        sa.sa_handler = setting.handler;
        sa.sa_flags = setting.flags;
        sigaction(SIGCHLD, &sa, &old_);
        sigset_t chld;
        sigemptyset(&chld);
        sigaddset(&chld, SIGCHLD);
        if (setting.bBlocked) sigprocmask(SIG_BLOCK, &chld, &oldMask_);
        gReapingHandlerCalls = 0;
        own_ = fork();
        if (own_ == 0) {
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
            _exit(0);
        }
    }
    SigchldScope(const SigchldScope &) = delete;
    SigchldScope &operator=(const SigchldScope &) = delete;
    ~SigchldScope() {
        // The caller's child may outlive a quick mix on a loaded machine:
        // it must have ended, and its SIGCHLD reached the handler, before
        // the setting goes.  (With SIGCHLD ignored, waitpid returns once
        // the child has ended and the kernel has reaped it.)
        if (setting_.handler == SIG_DFL || setting_.handler == SIG_IGN) waitpid(own_, nullptr, 0);
        for (int i = 0; i < 1000 && setting_.handler == ReapEveryChild && gReapingHandlerCalls == 0; ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        if (setting_.bBlocked) sigprocmask(SIG_SETMASK, &oldMask_, nullptr);
        sigaction(SIGCHLD, &old_, nullptr);
    }

private:
    const SigchldSetting &setting_;
    struct sigaction old_ {};
    sigset_t oldMask_{};
    pid_t own_ = -1;
};

}  // namespace xavo::test
