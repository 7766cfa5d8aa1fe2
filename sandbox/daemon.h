// Starting and stopping the real daemons the sandbox runs as peers
// (cupsd, snmpd, dbus-daemon, avahi-daemon): each in the foreground as a
// child of the process that starts it, stopped and reaped by its own pid.
#pragma once

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>

#include <string>
#include <vector>

#include "sandbox/sandbox.h"

extern char **environ;

namespace xavo::test {

// Starts argv[0] with standard input from /dev/null and its output and
// errors appended to logPath.  env: the whole environment, or empty for
// this process's.  -1 when it cannot be started.
inline pid_t StartDaemon(const std::vector<std::string> &argv, const std::string &logPath,
                         const std::vector<std::string> &env = {}) {
    auto pointers = [](const std::vector<std::string> &words) {
        std::vector<char *> out;
        for (const std::string &w : words) out.push_back(const_cast<char *>(w.c_str()));
        out.push_back(nullptr);
        return out;
    };
    std::vector<char *> args = pointers(argv);
    std::vector<char *> envp = pointers(env);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 1, logPath.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0644);
    posix_spawn_file_actions_adddup2(&actions, 1, 2);
    pid_t pid = -1;
    if (posix_spawn(&pid, args[0], &actions, nullptr, args.data(), env.empty() ? environ : envp.data()) != 0) {
        pid = -1;
    }
    posix_spawn_file_actions_destroy(&actions);
    return pid;
}

// Our child, not yet exited (a zombie counts as gone).  Leaves it to be
// reaped by StopDaemon, so that its pid cannot be taken by another process
// meanwhile.
inline bool DaemonRunning(pid_t pid) {
    if (pid <= 0) return false;
    std::string stat = ReadFile("/proc/" + std::to_string(pid) + "/stat");
    std::string::size_type close = stat.rfind(')');
    return close != std::string::npos && close + 2 < stat.size() && stat[close + 2] != 'Z';
}

// SIGTERM, up to graceMs to go, then SIGKILL; reaped either way.
inline void StopDaemon(pid_t pid, int graceMs = 2000) {
    if (pid <= 0) return;
    kill(pid, SIGTERM);
    for (int waited = 0; waited < graceMs; waited += 10) {
        if (waitpid(pid, nullptr, WNOHANG) == pid) return;
        poll(nullptr, 0, 10);
    }
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
}

}  // namespace xavo::test
