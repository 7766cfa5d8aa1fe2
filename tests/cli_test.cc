// The xavoprinter command: exit statuses, --json shapes, help, and the
// refusal of secrets on the command line.  The command runs as a child
// process inside the test's sandbox, as an appliance service would run it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <sstream>
#include <string>

#include "sandbox/sandbox.h"

using ::testing::HasSubstr;
using ::testing::StartsWith;

namespace {

struct CliRun { int status; std::string out, err; };

// Runs the command with the given arguments and standard input.
CliRun Cli(const std::vector<std::string> &args, const std::string &input = "") {
    xavo::test::PlaceFile("/tmp/cli.in", input);
    std::string cmd = XAVO_CLI_PATH;
    for (const std::string &a : args) {
        std::string quoted = "'";
        for (char c : a) quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
        cmd += " " + quoted + "'";
    }
    cmd += " </tmp/cli.in 2>/tmp/cli.err";
    CliRun run{};
    FILE *p = popen(cmd.c_str(), "r");
    std::array<char, 4096> buf{};
    size_t n;
    while ((n = fread(buf.data(), 1, buf.size(), p)) > 0) run.out.append(buf.data(), n);
    int st = pclose(p);
    run.status = WIFEXITED(st) ? WEXITSTATUS(st) : -1;
    run.err = xavo::test::ReadFile("/tmp/cli.err");
    return run;
}

TEST(Cli, ExitStatusesTellSuccessFailureAndUsage) {
    struct { std::vector<std::string> args; int status; } const cases[] = {
        {{}, 2},
        {{"frobnicate"}, 2},
        {{"usb", "enable", "lp0"}, 2},                // missing BUS
        {{"print", "id", "file", "--bogus"}, 2},      // unknown option
        {{"share", "status"}, 0},
        {{"show", "no-such-printer"}, 1},
    };
    for (const auto &c : cases) {
        CliRun r = Cli(c.args);
        EXPECT_EQ(r.status, c.status) << ::testing::PrintToString(c.args) << "\n" << r.out << r.err;
    }
}

TEST(Cli, FailureNamesThePlatformErrorCode) {
    CliRun r = Cli({"usbip", "eject", ""});
    EXPECT_EQ(r.status, 1);
    EXPECT_THAT(r.err, HasSubstr("XAVOPrinterUsbipEject failed: 0x0D00 ERR_BAD_PARAMETERS"));
    CliRun j = Cli({"usbip", "eject", "", "--json"});
    EXPECT_EQ(j.status, 1);
    EXPECT_EQ(j.out, "{\"ok\":false,\"error\":\"XAVOPrinterUsbipEject failed: 0x0D00 ERR_BAD_PARAMETERS\"}\n");
}

TEST(Cli, JsonIsOneObjectPerRun) {
    CliRun r = Cli({"usbip", "lock-status", "04b8:0005:X", "--json"});
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, "{\"printer_id\":\"04b8:0005:X\",\"lock\":\"Free\"}\n");
    CliRun list = Cli({"list", "--json"});
    EXPECT_EQ(list.status, 0);
    EXPECT_EQ(list.out, "{\"count\":0,\"printers\":[]}\n");
}

TEST(Cli, EverySubcommandHasHelpWithAnExample) {
    CliRun top = Cli({"--help"});
    for (const char *path : {"list", "show", "usb enable", "usb disable", "usb devid", "usb reset", "net probe",
                             "net add", "net remove", "net ping", "net check", "queue add", "queue enable",
                             "queue disable", "queue remove", "queue ppd", "queue purge-usb", "print",
                             "print test-page", "job wait", "spool clean", "share status", "cloud get",
                             "cloud set", "usbip eject", "usbip lock-status", "usbip release"}) {
        EXPECT_THAT(top.out, HasSubstr(std::string("  ") + path)) << path;
        std::vector<std::string> args;
        std::istringstream words(path);
        for (std::string w; words >> w;) args.push_back(w);
        args.push_back("--help");
        CliRun r = Cli(args);
        EXPECT_EQ(r.status, 0) << path;
        EXPECT_THAT(r.out, StartsWith("usage: xavoprinter " + std::string(path))) << path;
        EXPECT_THAT(r.out, HasSubstr("\nexample:\n  ")) << path;
    }
}

TEST(Cli, SecretsAreRefusedOnTheCommandLine) {
    for (const char *bad : {"--password", "--password=hunter2", "--refresh-token", "--secret=x"}) {
        CliRun r = Cli({"cloud", "set", "user@example.com", bad, "hunter2"});
        EXPECT_EQ(r.status, 2) << bad;
        EXPECT_THAT(r.err, HasSubstr("standard input")) << bad;
    }
    EXPECT_FALSE(xavo::test::FileExists("/usr/xavo/etc/printer.conf"));
}

TEST(Cli, CloudSecretComesFromStandardInputAndStaysOutOfTheFile) {
    CliRun set = Cli({"cloud", "set", "user@example.com", "--token"}, "tok-12345-secret\n");
    ASSERT_EQ(set.status, 0) << set.err;
    EXPECT_EQ(xavo::test::ReadFile("/usr/xavo/etc/printer.conf").find("tok-12345-secret"), std::string::npos);
    CliRun get = Cli({"cloud", "get", "--json"});
    EXPECT_EQ(get.out, "{\"account\":\"user@example.com\",\"secret_in_force\":\"refresh token\"}\n");
    CliRun reveal = Cli({"cloud", "get", "--reveal", "--json"});
    EXPECT_THAT(reveal.out, HasSubstr("\"secret\":\"tok-12345-secret\""));
}

}  // namespace
