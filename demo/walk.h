// The walk-through's machinery: shell command lines run in the sandbox and
// shown as they run, steps checked and counted, and the few helpers the
// steps share (colours, JSON values, shell quoting).
#pragma once

#include <signal.h>
#include <sys/types.h>

#include <string>
#include <utility>
#include <vector>

namespace xavo::demo {

// Colours on a terminal only.
extern bool g_color;
// Set by Ctrl-C, SIGTERM or SIGHUP: the walk stops at the next step and
// the clean-up runs, so that no daemon outlives the demo in the namespaces.
extern volatile sig_atomic_t g_stop;

void OnStopSignal(int);

struct Interrupted {};

struct Ran {
    int status = -1;  // exit status, or -1 when it could not run or was killed
    std::string output;
};

std::string Paint(const char *code, const std::string &text);
void Say(const std::string &text);
std::vector<char *> Pointers(const std::vector<std::string> &words);
int WaitExit(pid_t pid);
Ran RunShown(const std::string &command, const std::vector<std::string> &env);
void ShowLibraryLog();
std::string JsonText(const std::string &json, const std::string &key);
std::string Quoted(const std::string &word);

class Walk {
public:
    explicit Walk(std::vector<std::string> env) : env_(std::move(env)) {}

    void Chapter(const std::string &title) { Say("\n" + Paint("1", "== " + title)); }
    void Note(const std::string &text) { Say(Paint("36", "   " + text)); }

    // One step: shows the command, runs it, checks its exit status and,
    // when given, a text its output must hold.
    Ran Step(const std::string &command, int wantStatus = 0, const std::string &mustShow = "") {
        if (g_stop) throw Interrupted{};
        Say(Paint("33", "$ " + command));
        Ran ran = RunShown(command, env_);
        ShowLibraryLog();
        const bool bOk = ran.status == wantStatus && ran.output.find(mustShow) != std::string::npos;
        if (!bOk) {
            ++failures_;
            Say(Paint("31", "   !! expected exit status " + std::to_string(wantStatus) +
                                (mustShow.empty() ? "" : " and \"" + mustShow + "\"") + ", got " +
                                std::to_string(ran.status)));
        }
        ++steps_;
        return ran;
    }
    void Check(bool bOk, const std::string &what) {
        ++steps_;
        if (!bOk) ++failures_;
        Say(Paint(bOk ? "32" : "31", std::string("   ") + (bOk ? "ok: " : "!! ") + what));
    }
    int failures() const { return failures_; }
    int steps() const { return steps_; }
    const std::vector<std::string> &env() const { return env_; }

private:
    std::vector<std::string> env_;
    int steps_ = 0;
    int failures_ = 0;
};

}  // namespace xavo::demo
