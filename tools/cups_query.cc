#include "cups_query.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cctype>
#include <chrono>
#include <cstring>
#include <sstream>

extern char **environ;

namespace cli {
namespace {

constexpr char kLpstat[] = "/usr/bin/lpstat";
constexpr char kLpq[] = "/usr/bin/lpq";
// A client that hangs on a stuck scheduler must not hang the command.
constexpr auto kToolTimeLimit = std::chrono::seconds(20);

class Fd {
public:
    explicit Fd(int fd = -1) : fd_(fd) {}
    Fd(const Fd &) = delete;
    Fd &operator=(const Fd &) = delete;
    ~Fd() {
        if (fd_ >= 0) close(fd_);
    }
    int get() const { return fd_; }
    void reset() {
        if (fd_ >= 0) close(fd_);
        fd_ = -1;
    }

private:
    int fd_;
};

// The environment for a CUPS client: the caller's, with English
// messages, since the readers below match the clients' English texts.
std::vector<std::string> ClientEnvironment() {
    std::vector<std::string> env;
    for (char **e = environ; *e != nullptr; ++e) {
        std::string_view v(*e);
        if (v.starts_with("LC_") || v.starts_with("LANG=") || v.starts_with("LANGUAGE=")) continue;
        env.emplace_back(v);
    }
    env.emplace_back("LC_ALL=C");
    return env;
}

// Runs a CUPS client and returns its standard output, or nullopt when it
// could not be started or did not finish in time.  Its exit status says
// little: lpstat and lpq fail when CUPS has no queue at all.  Its complaints on
// standard error reach the terminal only with -v.
std::optional<std::string> Run(const std::vector<std::string> &args, bool bVerbose) {
    int aiPipe[2];
    if (pipe2(aiPipe, O_CLOEXEC) != 0) return std::nullopt;
    Fd readEnd(aiPipe[0]);
    Fd writeEnd(aiPipe[1]);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, writeEnd.get(), STDOUT_FILENO);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    if (!bVerbose) posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
    std::vector<char *> argv;
    for (const std::string &a : args) argv.push_back(const_cast<char *>(a.c_str()));
    argv.push_back(nullptr);
    std::vector<std::string> env = ClientEnvironment();
    std::vector<char *> envp;
    for (std::string &e : env) envp.push_back(e.data());
    envp.push_back(nullptr);
    pid_t pid = -1;
    const int rc = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), envp.data());
    posix_spawn_file_actions_destroy(&actions);
    if (rc != 0) return std::nullopt;
    // Only the child writes: the end of its output is the end of the pipe.
    writeEnd.reset();
    std::string out;
    const auto deadline = std::chrono::steady_clock::now() + kToolTimeLimit;
    bool bTimedOut = false;
    for (;;) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0) {
            bTimedOut = true;
            break;
        }
        pollfd p{readEnd.get(), POLLIN, 0};
        const int n = poll(&p, 1, static_cast<int>(left.count()));
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) continue;
        char buf[4096];
        const ssize_t got = read(readEnd.get(), buf, sizeof buf);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) break;
        out.append(buf, static_cast<size_t>(got));
    }
    if (bTimedOut) kill(pid, SIGKILL);
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    if (bTimedOut) return std::nullopt;
    return out;
}

std::vector<std::string> Lines(const std::string &text) {
    std::vector<std::string> lines;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

bool IsRank(std::string_view word) {
    if (word == "active") return true;
    size_t digits = 0;
    while (digits < word.size() && std::isdigit(static_cast<unsigned char>(word[digits]))) ++digits;
    const std::string_view suffix = word.substr(digits);
    return digits > 0 && (suffix == "st" || suffix == "nd" || suffix == "rd" || suffix == "th");
}

}  // namespace

std::optional<QueueLine> ParseLpstatPrinterLine(std::string_view line) {
    constexpr std::string_view kHead = "printer ";
    if (!line.starts_with(kHead)) return std::nullopt;
    line.remove_prefix(kHead.size());
    const size_t blank = line.find(' ');
    if (blank == 0 || blank == std::string_view::npos) return std::nullopt;
    const std::string_view rest = line.substr(blank + 1);
    if (rest.starts_with("disabled")) return QueueLine{std::string(line.substr(0, blank)), false};
    if (rest.starts_with("is ") || rest.starts_with("now ")) return QueueLine{std::string(line.substr(0, blank)), true};
    return std::nullopt;
}

std::optional<JobLine> ParseLpqJobLine(std::string_view line) {
    std::istringstream words{std::string(line)};
    std::string rank, owner, job;
    if (!(words >> rank >> owner >> job) || !IsRank(rank)) return std::nullopt;
    if (job.empty() || job.size() > 9 || job.find_first_not_of("0123456789") != std::string::npos) return std::nullopt;
    std::string rest;
    std::getline(words, rest);
    // The title column is followed by the size: "letter   1024 bytes".
    const size_t size = rest.rfind(" bytes");
    if (size != std::string::npos) {
        rest.erase(size);
        const size_t blank = rest.find_last_of(' ');
        rest.erase(blank == std::string::npos ? 0 : blank);
    }
    const size_t first = rest.find_first_not_of(' ');
    const size_t last = rest.find_last_not_of(' ');
    std::string title = first == std::string::npos ? "" : rest.substr(first, last - first + 1);
    return JobLine{std::stoi(job), title};
}

const char *QueueStateName(QueueState state) {
    switch (state) {
        case QueueState::kEnabled: return "enabled";
        case QueueState::kDisabled: return "disabled";
        case QueueState::kMissing: break;
    }
    return "missing";
}

QueueState Queues::StateOf(const std::string &name) const {
    for (const QueueLine &q : lines) {
        if (q.name == name) return q.bEnabled ? QueueState::kEnabled : QueueState::kDisabled;
    }
    return QueueState::kMissing;
}

std::optional<Queues> AskQueues(bool bVerbose) {
    std::optional<std::string> out = Run({kLpstat, "-r", "-p"}, bVerbose);
    if (!out) return std::nullopt;
    Queues queues;
    bool bRunning = false;
    for (const std::string &line : Lines(*out)) {
        if (line == "scheduler is running") bRunning = true;
        if (auto q = ParseLpstatPrinterLine(line)) queues.lines.push_back(*q);
    }
    if (!bRunning) return std::nullopt;
    return queues;
}

std::optional<QueueState> AskQueueState(const std::string &name, bool bVerbose) {
    const std::optional<Queues> queues = AskQueues(bVerbose);
    if (!queues) return std::nullopt;
    return queues->StateOf(name);
}

std::optional<std::vector<JobLine>> AskJobs(const std::string &queue, bool bVerbose) {
    std::optional<std::string> out =
        Run(queue.empty() ? std::vector<std::string>{kLpq, "-a"} : std::vector<std::string>{kLpq, "-P", queue},
            bVerbose);
    if (!out) return std::nullopt;
    std::vector<JobLine> jobs;
    for (const std::string &line : Lines(*out)) {
        if (auto j = ParseLpqJobLine(line)) jobs.push_back(*j);
    }
    return jobs;
}

}  // namespace cli
