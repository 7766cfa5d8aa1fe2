#include "demo/walk.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <regex>

#include <nlohmann/json.hpp>

#include "sandbox/sandbox.h"

namespace xavo::demo {

bool g_color = false;
volatile sig_atomic_t g_stop = 0;

void OnStopSignal(int) { g_stop = 1; }

std::string Paint(const char *code, const std::string &text) {
    return g_color ? std::string("\033[") + code + "m" + text + "\033[0m" : text;
}

void Say(const std::string &text) { std::printf("%s\n", text.c_str()); std::fflush(stdout); }

// An argv or envp view of words, which must outlive it.
std::vector<char *> Pointers(const std::vector<std::string> &words) {
    std::vector<char *> out;
    for (const std::string &w : words) out.push_back(const_cast<char *>(w.c_str()));
    out.push_back(nullptr);
    return out;
}

// The child's exit status; -1 when it was killed.
int WaitExit(pid_t pid) {
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}


namespace {

// A step that has not ended by then is stopped: the longest wait of the
// walk-through is a job wait of 30 seconds.
constexpr int kStepLimitMs = 120000;

// Shows what comes through fd, indented line by line, and keeps it in out;
// false when the step's time ran out first.
bool ShowUntilEnd(int fd, std::string &out) {
    std::string pending;
    char buf[4096];
    using Clock = std::chrono::steady_clock;
    const Clock::time_point deadline = Clock::now() + std::chrono::milliseconds(kStepLimitMs);
    bool bEnded = false;
    while (!bEnded) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
        if (left <= 0) break;
        pollfd p{fd, POLLIN, 0};
        if (poll(&p, 1, static_cast<int>(left)) <= 0) continue;  // interrupted, or the time is up
        ssize_t n = read(fd, buf, sizeof buf);
        if (n < 0 && errno == EINTR) continue;
        bEnded = n <= 0;
        if (bEnded) break;
        out.append(buf, static_cast<size_t>(n));
        pending.append(buf, static_cast<size_t>(n));
        for (size_t nl; (nl = pending.find('\n')) != std::string::npos; pending.erase(0, nl + 1)) {
            Say("    " + pending.substr(0, nl));
        }
    }
    if (!pending.empty()) Say("    " + pending);
    return bEnded;
}

}  // namespace

// Runs one shell command line in the sandbox and shows its output as it
// comes, indented, keeping a copy for the walk-through's checks.  A step
// that outlives its time is killed by its pid (its own children, if any,
// are stopped with the sandbox's other leftovers at the end).
Ran RunShown(const std::string &command, const std::vector<std::string> &env) {
    int fds[2];
    Ran ran;
    if (pipe2(fds, O_CLOEXEC) != 0) return ran;
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, fds[1], STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, fds[1], STDERR_FILENO);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    const std::vector<std::string> args = {"/bin/sh", "-c", command};
    std::vector<char *> argv = Pointers(args);
    std::vector<char *> envp = Pointers(env);
    pid_t pid = -1;
    int rc = posix_spawn(&pid, "/bin/sh", &actions, nullptr, argv.data(), envp.data());
    posix_spawn_file_actions_destroy(&actions);
    close(fds[1]);
    if (rc == 0) {
        if (!ShowUntilEnd(fds[0], ran.output)) {
            Say("    (stopped after " + std::to_string(kStepLimitMs / 1000) + " seconds)");
            kill(pid, SIGKILL);
        }
        ran.status = WaitExit(pid);
    }
    close(fds[0]);
    return ran;
}

// The library's own syslog lines ("unit:line message") logged during a
// step; the daemons' lines are left out.
void ShowLibraryLog() {
    static const std::regex kLibraryLine("^[a-z_]+:[0-9]+ .*");
    for (const xavo::test::LogLine &line : xavo::test::TakeLogs()) {
        if (std::regex_match(line.message, kLibraryLine)) Say(Paint("2", "    syslog: " + line.message));
    }
}

// The text under key in the one-line JSON object that xavoprinter --json
// prints; "" when absent or not text.
std::string JsonText(const std::string &json, const std::string &key) {
    const nlohmann::json object = nlohmann::json::parse(json, nullptr, false);
    const auto at = object.is_object() ? object.find(key) : object.end();
    return at != object.end() && at->is_string() ? at->get<std::string>() : "";
}

std::string Quoted(const std::string &word) {
    if (word.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._:/-") ==
        std::string::npos && !word.empty()) {
        return word;
    }
    std::string out = "'";
    for (char c : word) out += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return out + "'";
}
}  // namespace xavo::demo
