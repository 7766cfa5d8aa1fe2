// A real CUPS scheduler for the suites that talk to CUPS, private to the
// test's sandbox.
//
//     XAVO_SANDBOX_PER_SUITE(MyCupsSuite);   // one scheduler for the suite
//     class MyCupsSuite : public ::testing::Test {
//         void SetUp() override { xavo::test::Cupsd::Start(); }
//         static void TearDownTestSuite() { xavo::test::Cupsd::Stop(); }
//     };
//
// API (all static, header only):
//   Start()            configure (below), then run "/usr/sbin/cupsd -f" unless
//                      this sandbox's scheduler already runs, and wait until
//                      "lpstat -r" reports it running: cheap from SetUp().
//   Stop()             end this sandbox's scheduler by its process id (also
//                      one the platform started with ORLIServiceStart) and
//                      wait until it is gone; cupsd writes printers.conf on
//                      its way out.
//   Pid()              this sandbox's scheduler (same mount namespace), or 0.
//   Configure()        the private /etc/cups/cupsd.conf (only the domain
//                      socket /run/cups/cups.sock, no browsing, every local
//                      request allowed) and the real tools at the library's
//                      paths: exec wrappers "/usr/bin/lpadmin", "cupsenable",
//                      "cupsdisable" (Debian keeps them in /usr/sbin) and
//                      "/usr/bin/lpstat" (a wrapper of the copy kLpstat).  A
//                      test may place fakes there; the next Start() undoes it.
//   RemoveAllQueues()  empty queue list for the next test of the suite.
// Free functions:
//   Queue(name)        CUPS's own view of a queue through lpstat: exists,
//                      enabled, device URI, location.
//   Tool(argv)         run a program, its standard output (exit status via
//                      the optional second argument).
//
// Only the real CUPS tools are used; nothing here goes through the library.
// Waiting uses poll(), which the sandbox does not count as a library sleep.
#pragma once

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "sandbox/daemon.h"
#include "sandbox/sandbox.h"

extern char **environ;

namespace xavo::test {

// The real lpstat, kept where no test places a fake (see Configure()).
inline constexpr char kLpstat[] = "/usr/lib/xavo-test/lpstat";

// What CUPS reports about one queue.
struct QueueInfo {
    bool exists = false;
    bool enabled = false;    // "lpstat -p": not "disabled"
    std::string deviceUri;   // "lpstat -v"
    std::string location;    // "lpstat -l -p": "Location: ..."
};

// Runs argv[0] with the arguments, standard output captured (standard
// error dropped); *pStatus gets the exit status (-1 when it did not exit).
inline std::string Tool(const std::vector<std::string> &argv, int *pStatus = nullptr) {
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) return {};
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, fds[1], 1);
    posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", O_WRONLY, 0);
    std::vector<char *> args;
    for (const std::string &a : argv) args.push_back(const_cast<char *>(a.c_str()));
    args.push_back(nullptr);
    pid_t pid = -1;
    int rc = posix_spawn(&pid, args[0], &actions, nullptr, args.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    close(fds[1]);
    std::string out;
    char buf[4096];
    ssize_t n;
    while (rc == 0 && (n = read(fds[0], buf, sizeof buf)) != 0) {
        if (n > 0) out.append(buf, static_cast<size_t>(n));
        else if (errno != EINTR) break;
    }
    close(fds[0]);
    int status = -1;
    if (rc == 0) {
        while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
        }
    }
    if (pStatus) *pStatus = (rc == 0 && WIFEXITED(status)) ? WEXITSTATUS(status) : -1;
    return out;
}

inline QueueInfo Queue(const std::string &name) {
    QueueInfo info;
    int status = 0;
    std::string state = Tool({kLpstat, "-l", "-p", name}, &status);
    if (status != 0 || state.rfind("printer " + name + " ", 0) != 0) return info;
    info.exists = true;
    info.enabled = state.find(" disabled ") == std::string::npos;
    std::string::size_type at = state.find("Location: ");
    if (at != std::string::npos) {
        at += std::strlen("Location: ");
        info.location = state.substr(at, state.find('\n', at) - at);
    }
    std::string device = Tool({kLpstat, "-v", name});
    std::string prefix = "device for " + name + ": ";
    if (device.rfind(prefix, 0) == 0) {
        info.deviceUri = device.substr(prefix.size(), device.find('\n') - prefix.size());
    }
    return info;
}

class Cupsd {
public:
    static void Start() {
        Configure();
        if (Pid() > 0) return;
        if (StartDaemon({"/usr/sbin/cupsd", "-f"}, "/tmp/cupsd.out") < 0) return;
        for (int i = 0; i < 200 && !Answering(); ++i) poll(nullptr, 0, 25);
    }

    // Ends this sandbox's scheduler and waits until it has exited.
    static void Stop() {
        for (int round = 0; round < 4; ++round) {
            pid_t pid = Pid();
            if (pid <= 0) return;
            // A scheduler that ignores the request for 4 seconds is killed.
            kill(pid, round == 0 ? SIGTERM : SIGKILL);
            // Ours is our child and is reaped here; one the platform started
            // is gone from /proc once it exits.
            for (int i = 0; i < 400 && Alive(pid); ++i) {
                waitpid(pid, nullptr, WNOHANG);
                poll(nullptr, 0, 10);
            }
            // A child of ours may only now have become a zombie: reap it
            // (0 = not yet; anything else = reaped, or not our child).
            for (int i = 0; i < 100 && waitpid(pid, nullptr, WNOHANG) == 0; ++i) poll(nullptr, 0, 10);
        }
    }

    // The scheduler running in this sandbox (its mount namespace), or 0.
    static pid_t Pid() { return Find(true); }

    // Writes the scheduler's private configuration and puts the real tools
    // back at the library's paths (replacing fakes a test placed there),
    // without starting anything: for tests in which the platform starts
    // the scheduler.
    static void Configure() {
        PlaceFile("/etc/cups/cupsd.conf", kConfig);
        mkdir("/run/cups", 0755);
        // The fixture's own questions go to a copy of the real lpstat, so
        // that a test may put a fake at "/usr/bin/lpstat".
        if (!FileExists(kLpstat)) {
            Tool({"/bin/mkdir", "-p", "/usr/lib/xavo-test"});
            Tool({"/bin/cp", "-f", "/usr/bin/lpstat", kLpstat});
        }
        PlaceProgram("/usr/bin/lpstat", std::string("#!/bin/sh\nexec ") + kLpstat + " \"$@\"\n");
        for (const char *tool : {"lpadmin", "cupsenable", "cupsdisable"}) {
            std::string real = std::string("/usr/sbin/") + tool;
            if (access(real.c_str(), X_OK) == 0) {
                PlaceProgram(std::string("/usr/bin/") + tool, "#!/bin/sh\nexec " + real + " \"$@\"\n");
            }
        }
    }

    // Removes every queue, so that a test of a per-suite scheduler starts
    // from an empty list.
    static void RemoveAllQueues() {
        std::string list = Tool({kLpstat, "-v"});
        for (std::string::size_type at = 0; (at = list.find("device for ", at)) != std::string::npos;) {
            at += std::strlen("device for ");
            std::string name = list.substr(at, list.find(':', at) - at);
            Tool({"/usr/sbin/lpadmin", "-x", name});
        }
    }

private:
    static constexpr char kConfig[] =
        "LogLevel warn\n"
        "Listen /run/cups/cups.sock\n"
        "Browsing No\n"
        "WebInterface No\n"
        "DefaultAuthType None\n"
        "DirtyCleanInterval 0\n"
        "<Location />\n  Order allow,deny\n  Allow all\n</Location>\n"
        "<Policy default>\n  <Limit All>\n    Order deny,allow\n  </Limit>\n</Policy>\n";

    static pid_t Find(bool bOurs) {
        struct stat self;
        if (stat("/proc/self/ns/mnt", &self) != 0) return 0;
        pid_t found = 0;
        DIR *proc = opendir("/proc");
        if (proc == nullptr) return 0;
        while (dirent *entry = readdir(proc)) {
            pid_t pid = static_cast<pid_t>(std::atoi(entry->d_name));
            if (pid <= 0) continue;
            std::string dir = "/proc/" + std::string(entry->d_name);
            struct stat ns;
            if (ReadFile(dir + "/comm") != "cupsd\n" || stat((dir + "/ns/mnt").c_str(), &ns) != 0) continue;
            if ((ns.st_ino == self.st_ino) == bOurs && Alive(pid)) {
                found = pid;
                break;
            }
        }
        closedir(proc);
        return found;
    }
    static bool Answering() {
        return Tool({kLpstat, "-r"}).rfind("scheduler is running", 0) == 0;
    }
    static bool Alive(pid_t pid) {
        std::string stat = ReadFile("/proc/" + std::to_string(pid) + "/stat");
        std::string::size_type close = stat.rfind(')');
        return close != std::string::npos && close + 2 < stat.size() && stat[close + 2] != 'Z';
    }
};

}  // namespace xavo::test
