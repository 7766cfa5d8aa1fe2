// The xavoprinter command against a real scheduler: results checked
// against what CUPS holds afterwards (queues, their states, jobs), jobs
// followed by their handle, network printers added all or nothing, and
// one JSON shape per subcommand over a printer's whole life.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <map>
#include <string>
#include <vector>

#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "support/cli_run.h"

using ::testing::AllOf;
using ::testing::ContainsRegex;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;
using namespace xavo::test;
using Json = nlohmann::json;

namespace {

constexpr char kUsbId[] = "04b8:0005:SN0001";

XAVO_SANDBOX_PER_SUITE(CliCups);

class CliCups : public ::testing::Test {
protected:
    // One scheduler for the suite; the appliance's own files and the
    // queues are emptied before each test.
    void SetUp() override {
        Cupsd::Start();
        Cupsd::RemoveAllQueues();
        for (const char *path : {"/usr/xavo/etc/printer.conf", "/usr/xavo/etc/nptab", "/tmp/usbtab"}) std::remove(path);
        if (FileExists("/sys/class/usbmisc/lp0")) UnplugUsbDevice("lp0");
        PlaceFile("/tmp/letter.txt", "Dear printer,\n");
    }
    static void TearDownTestSuite() { Cupsd::Stop(); }

    // A run with --json, its exit status and the output's shape checked.
    static CliRun JsonRun(const std::vector<std::string> &args, int wantStatus, const std::string &input = "") {
        std::vector<std::string> withJson = args;
        withJson.push_back("--json");
        const CliRun r = Cli(withJson, input);
        EXPECT_EQ(r.status, wantStatus) << ::testing::PrintToString(args) << "\n" << r.out << r.err;
        EXPECT_EQ(JsonShapeProblem(r.out), "") << ::testing::PrintToString(args) << "\n" << r.out;
        return r;
    }
    static Json JsonOf(const std::vector<std::string> &args, int wantStatus) {
        return Json::parse(JsonRun(args, wantStatus).out);
    }
    // The queue state that list gives for the only printer registered.
    static Json QueueState() { return JsonOf({"list"}, 0)["printers"][0]["queue_state"]; }
};

TEST_F(CliCups, ListShowsEachPrintersQueueAndItsStateAndTheUsbipLock) {
    PlugUsbDevice({});
    ASSERT_EQ(Cli({"usb", "enable", "lp0", "1-1"}).status, 0);
    const Json before = JsonOf({"list"}, 0)["printers"];
    ASSERT_EQ(before.size(), 1u);
    EXPECT_EQ(before[0], (Json{{"id", kUsbId}, {"kind", "usb"}, {"cups_queue", nullptr}, {"queue_state", nullptr},
                               {"usbip_lock", "Free"}}));
    ASSERT_EQ(Cli({"queue", "add", kUsbId}).status, 0);
    ASSERT_EQ(Cli({"queue", "enable", "usbprinter1"}).status, 0);
    EXPECT_EQ(QueueState(), "enabled");
    Tool({"/usr/sbin/lpadmin", "-x", "usbprinter1"});
    EXPECT_EQ(QueueState(), "missing");
    // Its own questions to CUPS never reach the terminal.
    const CliRun text = Cli({"list"});
    EXPECT_THAT(text.out, HasSubstr("id=04b8:0005:SN0001  kind=usb  cups_queue=usbprinter1  queue_state=missing  "
                                    "usbip_lock=Free"));
    EXPECT_EQ(text.err, "");
}

TEST_F(CliCups, PrintGivesEachJobAUniqueHandleThatJobWaitFollows) {
    // The queue is left disabled, so that the jobs stay listed.
    PlugUsbDevice({});
    ASSERT_EQ(Cli({"usb", "enable", "lp0", "1-1"}).status, 0);
    ASSERT_EQ(Cli({"queue", "add", kUsbId}).status, 0);
    const Json first = JsonOf({"print", kUsbId, "/tmp/letter.txt", "--title", "letter"}, 0);
    const Json second = JsonOf({"print", kUsbId, "/tmp/letter.txt", "--title", "letter"}, 0);
    const std::string handle = first["job"];
    EXPECT_THAT(handle, StartsWith("xavo-"));
    EXPECT_NE(handle, second["job"]);
    EXPECT_EQ(first["title"], handle + " letter");
    ASSERT_TRUE(first["cups_job"].is_number()) << first;
    EXPECT_NE(first["cups_job"], second["cups_job"]);

    const Json held = JsonOf({"job", "wait", kUsbId, handle, "--timeout", "1"}, 1);
    EXPECT_EQ(held["complete"], false);
    // The number given is the job's own: cancelling it ends the wait.
    Tool({"/usr/bin/lprm", "-P", "usbprinter1", std::to_string(first["cups_job"].get<int>())});
    EXPECT_EQ(JsonOf({"job", "wait", kUsbId, handle, "--timeout", "5"}, 0)["complete"], true);
}

TEST_F(CliCups, NetAddUndoesItsStepsWhenTheQueueCannotBeMade) {
    PlaceProgram("/usr/bin/lpadmin", "#!/bin/sh\nexit 1\n");
    const Json add = JsonOf({"net", "add", "127.0.0.7", "office"}, 1);
    Cupsd::Start();  // puts the real lpadmin back
    EXPECT_THAT(ReadFile("/usr/xavo/etc/nptab"), Not(HasSubstr("127.0.0.7")));
    EXPECT_EQ(add["undone"], Json::array({"network printer table line 127.0.0.7"}));
    ASSERT_EQ(add["remains"].size(), 1u);
    EXPECT_THAT(add["remains"][0].get<std::string>(), HasSubstr("section [127.0.0.7-office]"));
}

// An address in use is refused among the rows of the JSON table below.
TEST_F(CliCups, NetAddRefusesANameInUseAndReplacesAPrinterOnlyWhenAsked) {
    ASSERT_EQ(Cli({"net", "add", "127.0.0.5", "bigbrand"}).status, 0);
    const CliRun refused = Cli({"net", "add", "127.0.0.6", "bigbrand"});
    EXPECT_EQ(refused.status, 1);
    EXPECT_THAT(refused.err, HasSubstr("127.0.0.5-bigbrand"));
    EXPECT_EQ(ReadFile("/usr/xavo/etc/nptab"), "127.0.0.5=\"bigbrand\"\n");
    EXPECT_TRUE(Queue("bigbrand").exists);

    const Json replaced = JsonOf({"net", "add", "127.0.0.5", "xb", "--replace"}, 0);
    EXPECT_EQ(replaced["replaced"], Json::array({"127.0.0.5-bigbrand"}));
    EXPECT_EQ(ReadFile("/usr/xavo/etc/nptab"), "127.0.0.5=\"xb\"\n");
    EXPECT_FALSE(Queue("bigbrand").exists);
    EXPECT_TRUE(Queue("xb").exists);
}

// Among the failures: removals that match nothing, and a spool clean
// after which CUPS still lists jobs, each saying what is left.
TEST_F(CliCups, EverySubcommandPrintsOneJsonShapeOnSuccessAndFailure) {
    PlugUsbDevice({});
    const struct {
        std::vector<std::string> args;
        int status;
        std::string input = "";
        ::testing::Matcher<std::string> out = ::testing::_;
    } runs[] = {
        {{"list"}, 0},
        {{"show", kUsbId}, 1},
        {{"usb", "enable", "lp0", "1-1"}, 0},
        {{"usb", "enable", "lp7", "1-1"}, 1},
        {{"usb", "devid", "lp1"}, 1},
        {{"usb", "reset", "lp1"}, 1},
        {{"show", kUsbId}, 0},
        {{"queue", "remove", kUsbId}, 1, "", HasSubstr("has no CUPS queue name")},
        {{"queue", "add", "no-such-printer"}, 1},
        {{"queue", "add", kUsbId}, 0},
        {{"queue", "enable", "usbprinter1"}, 0},
        {{"queue", "disable", "usbprinter1"}, 0},
        {{"queue", "disable", "nosuch"}, 1},
        {{"queue", "check", kUsbId, "usbprinter1"}, 0},
        {{"queue", "ppd", kUsbId}, 1},
        {{"print", kUsbId, "/tmp/letter.txt"}, 0},
        {{"print", "no-such-printer", "/tmp/letter.txt"}, 1},
        // The test page's handle is the file's name: the library gives it no title.
        {{"print", "test-page", kUsbId}, 0, "", ContainsRegex(R"("job":"testprint","cups_job":[0-9]+,)")},
        {{"print", "test-page", "no-such-printer"}, 1},
        {{"job", "wait", kUsbId, "testprint", "--timeout", "1"}, 1},
        // The queue is disabled: the letter and the test page stay listed.
        {{"spool", "clean"}, 1, "",
         AllOf(HasSubstr(R"("cleaned":false,"jobs_left":2,)"), HasSubstr("still lists 2 job"))},
        {{"net", "ping", "127.0.0.1"}, 0},
        {{"net", "add", "127.0.0.5", "bigbrand"}, 0},
        {{"net", "add", "127.0.0.5", "xb"}, 1, "", HasSubstr("already in use (127.0.0.5-bigbrand")},
        {{"net", "check", "127.0.0.5", "bigbrand"}, 0},
        {{"net", "check", "127.0.0.5"}, 0},
        {{"net", "remove", "127.0.0.5", "bigbrand"}, 0},
        {{"net", "remove", "127.0.0.5", "bigbrand"}, 1, "", HasSubstr("no network printer 127.0.0.5-bigbrand")},
        {{"net", "probe", "127.0.0.9"}, 1},
        {{"queue", "remove", kUsbId}, 0},
        {{"queue", "remove", kUsbId}, 1, "", HasSubstr("nothing to remove: CUPS has no queue usbprinter")},
        {{"queue", "purge-usb"}, 1},
        {{"usb", "disable", "--bus", "9-9"}, 1, "", HasSubstr("nothing to forget: no line for bus 9-9")},
        {{"usb", "disable", "lp0"}, 0},
        {{"share", "status"}, 0},
        {{"cloud", "get"}, 1},
        {{"cloud", "set", "u@example.com"}, 1, ""},
        {{"cloud", "set", "u@example.com"}, 0, "secret-1\n"},
        {{"cloud", "get"}, 0},
        {{"usbip", "lock-status", kUsbId}, 0},
        {{"usbip", "eject", kUsbId}, 1},
        {{"usbip", "release", kUsbId}, 1},
    };
    std::map<std::string, std::vector<std::string>> shapes;
    for (const auto &run : runs) {
        const CliRun r = JsonRun(run.args, run.status, run.input);
        const std::string what = ::testing::PrintToString(run.args);
        EXPECT_THAT(r.out, run.out) << what;
        EXPECT_EQ(r.out.find("\"-\""), std::string::npos) << what;
        // "print ID FILE", "list" and "show" are subcommands of one word.
        const bool bOneWord = run.args[0] == "list" || run.args[0] == "show" ||
                              (run.args[0] == "print" && run.args[1] != "test-page");
        const std::string path = bOneWord ? run.args[0] : run.args[0] + " " + run.args[1];
        const auto [at, bNew] = shapes.emplace(path, JsonKeys(r.out));
        if (!bNew) {
            EXPECT_EQ(at->second, JsonKeys(r.out)) << what;
        }
    }
    EXPECT_EQ(shapes.size(), 28u);
}

}  // namespace
