// The platform stand-in's process runner, driven directly: every program
// run ends within its time limit together with what it started, the
// programs' standard error goes to syslog instead of the caller's terminal,
// only the appliance's own file name pattern is expanded, arguments reach
// the program as given, and the child gets /dev/null for input and the C
// locale.  What a caller's SIGCHLD handling may not change is proven
// through every entry point by the child-hygiene proof.  And the lookup of
// a running daemon: the one found last time is looked at first but never
// taken on trust (the same lookup answers ORLICIsProcAlive).
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <string>
#include <thread>
#include <vector>

#include "appliance/standin_control.h"
#include "sandbox/sandbox.h"
#include "support/logs.h"
#include "support/processes.h"
#include "xavocore.h"

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kTool[] = "/usr/bin/xavo-tool";
constexpr double kSlack = 1.5;  // a loaded machine's delay on top

// All of a stream; a read that a signal interrupted is taken again.
std::string ReadAll(FILE *stream) {
    std::string text;
    for (;;) {
        errno = 0;
        const int ch = std::fgetc(stream);
        if (ch != EOF) {
            text += static_cast<char>(ch);
        } else if (errno == EINTR) {
            std::clearerr(stream);
        } else {
            return text;
        }
    }
}

int32_t PopenAndRead(std::string *pOut) {
    FILE *stream = ORLICPopen(kTool, "r", "a", nullptr);
    if (stream == nullptr) return -100;
    *pOut = ReadAll(stream);
    return ORLICPclose(stream);
}

// The two ways a run is waited for, reduced to "result, output read":
// ORLICExecl and ORLICExecv wait as ORLICExec does (one runner under the
// three), and every entry point is run through the library by the
// child-hygiene proof.  The last row is a caller that blocks every signal
// and ignores SIGCHLD, so that neither a signal nor its child's exit can
// wake the wait.
struct EntryPoint {
    const char *szName;
    int32_t (*run)(std::string *pOut);
    bool bReads;
};
const EntryPoint kEntryPoints[] = {
    {"ORLICExec", [](std::string *) { return ORLICExec(kTool, "a", nullptr, nullptr, nullptr); }, false},
    {"ORLICPopen", PopenAndRead, true},
    {"ORLICPopen, every signal blocked, SIGCHLD ignored",
     [](std::string *pOut) {
         SigchldScope ignored(kSigchldSettings[1]);
         sigset_t all, old;
         sigfillset(&all);
         pthread_sigmask(SIG_SETMASK, &all, &old);
         const int32_t result = PopenAndRead(pOut);
         pthread_sigmask(SIG_SETMASK, &old, nullptr);
         return result;
     },
     true},
};

// A tool that prints a line, starts a helper of its own that never ends,
// and never ends either.
constexpr char kNeverEnding[] =
    "#!/bin/sh\necho started\nsleep 1000 &\necho $! > /tmp/helper.pid\nwhile :; do sleep 1; done\n";

// A stand-in cupsd: sleep under the daemon's name, so that the kernel
// gives the process that command name.
pid_t StartFakeCupsd() {
    PlaceFile("/tmp/fake/cupsd", ReadFile("/bin/sleep"), 0755);
    const char *argv[] = {"cupsd", "30", nullptr};
    pid_t pid = -1;
    EXPECT_EQ(posix_spawn(&pid, "/tmp/fake/cupsd", nullptr, nullptr, const_cast<char **>(argv), environ), 0);
    AwaitCommandName(pid, "cupsd");
    return pid;
}

}  // namespace

TEST(RunnerTimeLimit, EveryEntryPointStopsTheToolAndWhatItStartedAtTheLimit) {
    XavoStandinSetToolTimeLimit(1);
    for (const EntryPoint &e : kEntryPoints) {
        PlaceProgram(kTool, kNeverEnding);
        ORLICErrSetEx(0, "", 0);
        std::string out;
        const auto start = std::chrono::steady_clock::now();
        EXPECT_EQ(e.run(&out), -1) << e.szName;
        const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
        EXPECT_GE(seconds, 0.9) << e.szName;
        EXPECT_LT(seconds, 1 + kSlack) << e.szName << ": the tool ends at SIGTERM";
        EXPECT_EQ(ORLICErrGet(), 0x2A00u) << e.szName;
        if (e.bReads) {
            EXPECT_EQ(out, "started\n") << e.szName;
        }
        EXPECT_TRUE(EndsSoon(std::stoi(ReadFile("/tmp/helper.pid")))) << e.szName << ": its group is stopped";
        EXPECT_THAT(ProgramLogs(), ElementsAre("7 xavo-tool: no exit within its time limit, stopped")) << e.szName;
        EXPECT_TRUE(NothingLeft()) << e.szName;
    }
    // 0 gives every tool its own limit again (more than 1.2 s).  The
    // SIGKILL after the grace, for a tool that ignores SIGTERM, is proven by
    // the proof suite of child hygiene.
    PlaceProgram(kTool, "#!/bin/sh\nsleep 1.2\n");
    XavoStandinSetToolTimeLimit(0);
    EXPECT_EQ(ORLICExec(kTool, nullptr, nullptr, nullptr, nullptr), 0);
}

TEST(RunnerStderr, LinesGoToSyslogTaggedWithTheToolNeverToTheCallersStderr) {
    PlaceProgram(kTool, "#!/bin/sh\n"
                        "echo 'first line' >&2\n"
                        "echo 'xavo-tool: tagged already' >&2\n"
                        "printf 'colour \\033[31mred\\r\\n\\n' >&2\n"
                        "head -c 1500 /dev/zero | tr '\\0' a >&2\n"
                        "echo out\n"
                        "printf 'no newline' >&2\n"
                        "exit 3\n");
    const std::vector<std::string> expected = {
        "7 xavo-tool: first line", "7 xavo-tool: tagged already", "7 xavo-tool: colour ?[31mred",
        "7 xavo-tool: " + std::string(1024, 'a'), "7 xavo-tool: " + std::string(1500 - 1024, 'a') + "no newline"};
    // The caller's descriptor 2 becomes a file for the time of the call.
    // Both ways of running share the relay: ORLICPopen's is the flood's.
    FILE *pCaught = std::tmpfile();
    ASSERT_NE(pCaught, nullptr);
    const int savedStderr = dup(2);
    dup2(fileno(pCaught), 2);
    const int32_t iExec = ORLICExec(kTool, nullptr, nullptr, nullptr, nullptr);
    dup2(savedStderr, 2);
    close(savedStderr);
    EXPECT_EQ(iExec, 3);
    EXPECT_EQ(ProgramLogs(), expected);
    EXPECT_EQ(std::ftell(pCaught), 0) << "nothing on the caller's stderr";
    std::fclose(pCaught);

    // Far more than a pipe holds, while the caller waits or reads: relayed
    // as it comes, so the tool never blocks on it, and never to the caller.
    PlaceProgram(kTool, "#!/bin/sh\nseq 1 20000 | sed 's/^/line /' >&2\necho done\n");
    XavoStandinSetToolTimeLimit(20);
    EXPECT_EQ(ORLICExec(kTool, nullptr, nullptr, nullptr, nullptr), 0);
    FILE *stream = ORLICPopen(kTool, "r", nullptr);
    ASSERT_NE(stream, nullptr);
    EXPECT_EQ(ReadAll(stream), "done\n");
    EXPECT_EQ(ORLICPclose(stream), 0);
    const std::vector<std::string> lines = ProgramLogs();
    ASSERT_EQ(lines.size(), 40000u);
    EXPECT_EQ(lines[19999], "7 xavo-tool: line 20000");
}

// Only "/var/services/printer/*.*" given to /bin/rm is a pattern; any other
// argument is a name, whatever characters it holds.
TEST(RunnerPatterns, OnlyTheSpoolPatternOfRmIsExpanded) {
    for (const char *name : {"/tmp/p/a1", "/tmp/p/a2", "/tmp/src", "/var/services/printer/job.pdf"}) {
        PlaceFile(name, name);
    }
    EXPECT_EQ(ORLICExec("/bin/cp", "-f", "/tmp/src", "/tmp/p/a*", nullptr), 0);
    EXPECT_EQ(ReadFile("/tmp/p/a*"), "/tmp/src") << "a new file of that very name";
    EXPECT_EQ(ReadFile("/tmp/p/a1"), "/tmp/p/a1");
    EXPECT_EQ(ORLICExec("/bin/rm", "-f", "/tmp/p/a?", "/tmp/p/[a]2", nullptr), 0);
    EXPECT_TRUE(FileExists("/tmp/p/a1") && FileExists("/tmp/p/a2"));
    EXPECT_EQ(ORLICExec("/bin/cp", "/var/services/printer/*.*", "/tmp/p/", nullptr, nullptr), 1)
        << "no file of that name: cp fails";
    EXPECT_TRUE(FileExists("/var/services/printer/job.pdf"));
}

TEST(RunnerStart, ProgramThatCannotBeStartedFailsAtOnceWithItsReason) {
    errno = 0;
    EXPECT_EQ(ORLICExec("/usr/bin/xavo-missing", nullptr, nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    EXPECT_EQ(ORLICPopen("/usr/bin/xavo-missing", "r", nullptr), nullptr);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    EXPECT_THAT(Descendants(), IsEmpty());
}

// The arguments reach the program as given, never through a shell.
TEST(PlatformProcess, PopenPassesTheArgumentsAsGivenAndReportsTheStatus) {
    PlaceProgram("/usr/bin/xavo-show-args", "#!/bin/sh\nprintf '%s\\n' \"$@\"\nexit 4\n");
    FILE *out = ORLICPopen("/usr/bin/xavo-show-args", "r", "a b", "$(touch /tmp/pwned)", "*", nullptr);
    ASSERT_NE(out, nullptr);
    EXPECT_EQ(ReadAll(out), "a b\n$(touch /tmp/pwned)\n*\n");
    EXPECT_EQ(ORLICPclose(out), 4);
    EXPECT_EQ(ORLICErrGet(), 0x2A00u);
    EXPECT_FALSE(FileExists("/tmp/pwned"));
    EXPECT_LT(ORLICPclose(stdin), 0) << "not a stream of ORLICPopen";
}

TEST(PlatformProcess, ChildGetsNullInputAndTheCLocale) {
    setenv("LANG", "de_DE.UTF-8", 1);
    setenv("XAVO_CALLERS_SECRET", "x", 1);
    FILE *out = ORLICPopen("/bin/sh", "r", "-c", "readlink /proc/self/fd/0; env | sort", nullptr);
    ASSERT_NE(out, nullptr);
    std::string text = ReadAll(out);
    EXPECT_EQ(ORLICPclose(out), 0);
    unsetenv("LANG");
    unsetenv("XAVO_CALLERS_SECRET");
    EXPECT_THAT(text, ::testing::AllOf(StartsWith("/dev/null\n"), HasSubstr("LC_ALL=C\n"), HasSubstr("PATH="),
                                       Not(HasSubstr("LANG=")), Not(HasSubstr("XAVO_CALLERS_SECRET"))));
}

TEST(PlatformServices, DaemonFoundLastIsCheckedAgainEveryTime) {
    ASSERT_EQ(ORLIServiceIsRunning("cupsd"), 0);
    const pid_t first = StartFakeCupsd();
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 1);
    EXPECT_EQ(ORLICIsProcAlive("cupsd"), 1) << "the same lookup, nothing remembered";
    ASSERT_EQ(kill(first, SIGKILL), 0);
    // A zombie is no running daemon, nor a reaped one.  Only this process
    // reaps its child: until the waitpid below, an ended one is a zombie.
    for (int i = 0; i < 400 && Running(first); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(5));
    ASSERT_FALSE(Running(first));
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 0) << "zombie";
    EXPECT_EQ(ORLICIsProcAlive("cupsd"), 0) << "zombie";
    ASSERT_EQ(waitpid(first, nullptr, 0), first);
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 0) << "reaped";
    const pid_t second = StartFakeCupsd();
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 1);
    kill(second, SIGKILL);
    waitpid(second, nullptr, 0);
}

