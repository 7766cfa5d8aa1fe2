// The xavoprinter command without a scheduler: usage errors caught before
// anything runs, help at every level, errors in words, secrets refused
// before they are stored, the terminal given back, text and JSON safe
// whatever bytes a printer supplied.  The command runs as a child process
// inside the test's sandbox.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <signal.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "support/cli_run.h"

using ::testing::AllOf;
using ::testing::ContainsRegex;
using ::testing::Eq;
using ::testing::HasSubstr;
using ::testing::Not;
using namespace xavo::test;

namespace {

constexpr char kPrinterConf[] = "/usr/xavo/etc/printer.conf";

// Usage errors exit 2 with nothing on standard output, failures 1 with a
// sentence and the platform's code only where there is one (the whole of
// standard error: without -v no syslog line of the library); nothing is
// written either way.  Secrets among the usage errors: never taken from
// the command line, where any user can read them in the process list.
TEST(Cli, UsageErrorsExitTwoAndFailuresOneWithASentenceBeforeAnythingIsWritten) {
    const struct {
        std::vector<std::string> args;
        int status = 2;
        ::testing::Matcher<std::string> err = ::testing::_;
    } cases[] = {
        {{}},
        {{"frobnicate"}},
        {{"usb"}},                                      // a group without its subcommand
        {{"usb", "enable", "lp0"}},                     // missing BUS
        {{"usb", "disable"}},                           // neither DEV nor --bus
        {{"print", "id", "/etc/hostname", "--bogus"}},  // unknown option
        {{"print", "id"}},                              // missing FILE
        {{"print", "id", "/no/such/file"}},
        {{"job", "wait", "id", "j", "--timeout", "30s"}},
        {{"job", "wait", "id", "j", "--timeout", "-5"}},
        {{"job", "wait", "id", "j", "--timeout", "0"}},
        {{"net", "add", "999.1.1.1", "office"}},
        {{"net", "add", "127.0.0.7", "my printer"}},
        {{"net", "add", "127.0.0.7", "a/b"}},
        {{"net", "add", "127.0.0.7", std::string(128, 'q')}},
        {{"net", "add", "127.0.0.7", "office", "--backend", "carrier-pigeon"}},
        {{"net", "ping", "127.1"}},
        {{"usbip", "eject", ""}},
        {{"show", std::string(128, 'x')}},
        {{"cloud", "set", std::string(255, 'a')}},
        {{"cloud", "set", "user@example.com", "--password", "hunter2"}, 2, HasSubstr("standard input")},
        {{"cloud", "set", "user@example.com", "--refresh-token", "hunter2"}, 2, HasSubstr("standard input")},
        {{"cloud", "set", "user@example.com", "--secret=x", "hunter2"}, 2, HasSubstr("standard input")},
        {{"usb", "devid", "lp1"}, 1, Eq("xavoprinter: no usblp device lp1 (not present)\n")},
        {{"usb", "devid", "lp1", "-v"}, 1, HasSubstr("printer_get_string_id:")},
        {{"cloud", "get"}, 1, Eq("xavoprinter: no cloud print account is stored\n")},
        {{"usb", "enable", "lp7", "1-1"}, 1,
         Eq("xavoprinter: lp7 was not registered: the appliance supports lp0 and lp1 only\n")},
        {{"usb", "disable", "lp1"}, 1, Eq("xavoprinter: nothing to forget: no line for lp1 in /tmp/usbtab\n")},
        {{"show", "no-such-printer"}, 1,
         Eq("xavoprinter: no printer no-such-printer in /usr/xavo/etc/printer.conf\n")},
        {{"usbip", "eject", "04b8:0005:X"}, 1,
         Eq("xavoprinter: bind_driver could not eject 04b8:0005:X (0x2A00 ERR_EXEC)\n")},
    };
    for (const auto &c : cases) {
        const CliRun r = Cli(c.args);
        EXPECT_EQ(r.status, c.status) << ::testing::PrintToString(c.args) << "\n" << r.out << r.err;
        if (c.status == 2) {
            EXPECT_EQ(r.out, "") << ::testing::PrintToString(c.args);
        }
        EXPECT_THAT(r.err, c.err) << ::testing::PrintToString(c.args);
    }
    EXPECT_FALSE(FileExists(kPrinterConf));
    EXPECT_FALSE(FileExists("/usr/xavo/etc/nptab"));
}

// A group without its subcommand answers with the group's own help; every
// subcommand gets its example from the one place that makes it runnable,
// so one of them stands for all.
TEST(Cli, HelpListsTheGroupsAndTheirSubcommandsShowsAnExampleAndVersionAnswers) {
    const struct {
        std::string group;
        std::vector<std::string> subcommands;
    } groups[] = {
        {"usb", {"enable", "disable", "devid", "reset"}},
        {"net", {"probe", "add", "remove", "ping", "check"}},
        {"queue", {"add", "enable", "disable", "remove", "ppd", "check", "purge-usb"}},
        {"job", {"wait"}},
        {"spool", {"clean"}},
        {"share", {"status"}},
        {"cloud", {"get", "set"}},
        {"usbip", {"eject", "release", "lock-status"}},
    };
    const CliRun top = Cli({"--help"});
    EXPECT_EQ(top.status, 0);
    const CliRun version = Cli({"--version"});
    EXPECT_EQ(version.status, 0);
    EXPECT_EQ(version.out, std::string("xavoprinter ") + XAVO_VERSION + "\n");
    for (const auto &g : groups) {
        EXPECT_THAT(top.out, HasSubstr("  " + g.group + " ")) << g.group;
        const CliRun bare = Cli({g.group});
        EXPECT_THAT(bare.err, HasSubstr("Usage: xavoprinter " + g.group)) << g.group;
        for (const std::string &sub : g.subcommands) {
            EXPECT_THAT(bare.err, HasSubstr("  " + sub + " ")) << g.group << " " << sub;
        }
    }
    const CliRun leaf = Cli({"job", "wait", "--help"});
    EXPECT_EQ(leaf.status, 0);
    EXPECT_THAT(leaf.out,
                AllOf(HasSubstr("Usage: xavoprinter job wait"), HasSubstr("Example:\n  "), HasSubstr("header lines")));
}

// What the bash completion offers after the given words (the last one is
// the word being completed).
std::string Completions(const std::string &words) {
    PlaceFile("/tmp/complete.sh", std::string("source ") + XAVO_COMPLETION + "\nCOMP_WORDS=(" XAVO_CLI_PATH " " + words +
                                      ")\nCOMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n_xavoprinter\necho \"${COMPREPLY[*]}\"\n");
    return Tool({"/bin/bash", "--norc", "/tmp/complete.sh"});
}

TEST(Cli, BashCompletionOffersSubcommandsOptionsAndDevices) {
    const struct {
        std::string words, offered;
    } cases[] = {
        {"''", "list show usb net queue print job spool share cloud usbip --help --version\n"},
        {"usb ''", "enable disable devid reset\n"},
        {"usb enable ''", "lp0 lp1\n"},
        {"job wait id job --t", "--timeout\n"},
        {"net add 192.0.2.1 office --backend ''", "socket lpd ipp bjnp\n"},
    };
    for (const auto &c : cases) EXPECT_EQ(Completions(c.words), c.offered) << c.words;
}

TEST(Cli, SecretsThatWouldBeStoredEmptyOrCutAreRefusedBeforeAnythingIsWritten) {
    const struct {
        bool bToken;
        std::string input;
        bool bStored;
    } cases[] = {
        {false, "\n", false},
        {false, std::string(128, 'p') + "\n", false},
        {false, std::string("pa\0ss\n", 6), false},
        {true, std::string(256, 't') + "\n", false},
        {false, std::string(127, 'p') + "\n", true},
        {true, std::string(255, 't') + "\r\n", true},
    };
    for (const auto &c : cases) {
        ResetSandbox();
        std::vector<std::string> args = {"cloud", "set", "u@example.com"};
        if (c.bToken) args.push_back("--token");
        const CliRun set = Cli(args, c.input);
        EXPECT_EQ(set.status, c.bStored ? 0 : 1) << c.input.size() << set.err;
        const CliRun get = Cli({"cloud", "get", "--reveal", "--json"});
        if (!c.bStored) {
            EXPECT_FALSE(FileExists(kPrinterConf)) << c.input.size();
            EXPECT_THAT(set.err, HasSubstr("nothing was stored"));
            continue;
        }
        std::string secret = c.input.substr(0, c.input.find_first_of("\r\n"));
        EXPECT_EQ(nlohmann::json::parse(get.out)["secret"], secret);
        EXPECT_EQ(nlohmann::json::parse(Cli({"cloud", "get", "--json"}).out)["secret"], nullptr);
        // show names the secret's key but never its enciphered value.
        EXPECT_THAT(Cli({"show", "Google Cloud Print"}).out,
                    ContainsRegex("key=(google pass|refresh token)  value=\\(none\\)"));
    }
}

bool EchoOn(int fd) {
    termios t{};
    return tcgetattr(fd, &t) == 0 && (t.c_lflag & ECHO) != 0;
}

// The command at its password prompt on a pseudo-terminal, stopped by a
// signal or, for 0, given the secret: the echo is back on either way, and
// a typed secret is stored without having been echoed.
TEST(Cli, PromptGivesTheTerminalBackOnCtrlCAndSigterm) {
    for (int sig : {SIGINT, SIGTERM, SIGHUP, 0}) {
        int master = -1;
        const pid_t pid = forkpty(&master, nullptr, nullptr, nullptr);
        if (pid == 0) {
            execl(XAVO_CLI_PATH, XAVO_CLI_PATH, "cloud", "set", "u@example.com", static_cast<char *>(nullptr));
            _exit(127);
        }
        ASSERT_GT(pid, 0);
        // Bounded wait until the prompt has turned the echo off.
        for (int i = 0; i < 500 && EchoOn(master); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(10));
        ASSERT_FALSE(EchoOn(master)) << "the prompt never turned the echo off";
        if (sig != 0) {
            kill(pid, sig);
        } else {
            ASSERT_EQ(write(master, "typed-secret\n", 13), 13);
        }
        std::string shown;
        char buf[256];
        pollfd pfd{master, POLLIN, 0};
        for (ssize_t n; poll(&pfd, 1, 10000) == 1 && (n = read(master, buf, sizeof buf)) > 0;) {
            shown.append(buf, static_cast<size_t>(n));
        }
        int status = 0;
        ASSERT_EQ(waitpid(pid, &status, 0), pid);
        if (sig != 0) {
            EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == sig) << sig;
        } else {
            EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << shown;
        }
        EXPECT_TRUE(EchoOn(master)) << "echo left off after signal " << sig;
        EXPECT_THAT(shown, AllOf(HasSubstr("password: "), Not(HasSubstr("typed-secret"))));
        close(master);
        EXPECT_EQ(FileExists(kPrinterConf), sig == 0) << sig;
    }
    EXPECT_EQ(nlohmann::json::parse(Cli({"cloud", "get", "--reveal", "--json"}).out)["secret"], "typed-secret");
}

TEST(Cli, PrinterSuppliedBytesGiveValidJsonAndHarmlessText) {
    PlaceFile(kPrinterConf, "[p\xff\xfe]\n\tproducer = \x1b[2J\xc2\x9b" "31mACME\xff\n");
    const CliRun json = Cli({"show", "p\xff\xfe", "--json"});
    EXPECT_EQ(json.status, 0) << json.err;
    EXPECT_EQ(JsonShapeProblem(json.out), "") << json.out;
    const CliRun text = Cli({"show", "p\xff\xfe"});
    EXPECT_THAT(text.out, HasSubstr("value=\\x1B[2J\\xC2\\x9B31mACME\\xFF"));
    EXPECT_EQ(text.out.find('\x1b'), std::string::npos);
    EXPECT_THAT(text.out, HasSubstr("id: p\\xFF\\xFE"));
}

}  // namespace
