// The core stand-in's shortcuts giving the same answers as the long way:
// section operations that search for a header instead of splitting the
// file (where a section starts and ends when headers are indented, names
// hold brackets or a header's text turns up inside a value), a setup's read
// kept for its next calls never outliving the file it was read from, call
// counters without a lock, lists that start small, and the daemon found
// last time looked at first but never taken on trust (the same lookup
// answers ORLICIsProcAlive).
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "appliance/standin_control.h"
#include "internal/guards.h"
#include "sandbox/sandbox.h"
#include "support/processes.h"
#include "support/sections.h"
#include "xavocore.h"

using xavo::SzHash;
using namespace xavo::test;

namespace {

constexpr char kFmt[] = "\t%s = %s\n";
constexpr char kConf[] = "/usr/xavo/etc/printer.conf";

SzHash Hash(const Section &keys) {
    SzHash hash(ORLICSzHashAlloc(512));
    for (const auto &[k, v] : keys) ORLICSzHashSetValue(hash.addr(), k.c_str(), v.c_str());
    return hash;
}

int32_t Set(const char *name, const Section &keys) {
    return ORLICFileSetSection(kConf, name, name, Hash(keys).get(), kFmt);
}

struct EditCase {
    const char *what;
    const char *before;
    int32_t (*edit)();
    int32_t result;
    const char *after;
};

// A replaced section takes the place of the first of its name, further ones
// go, and everything outside them stays byte for byte.
const EditCase kEdits[] = {
    {"indented header, comment after the last key stays", "[a]\n\tk = 1\n  [p]\n\tk = old\n# note\n[b]\n",
     [] { return Set("p", {{"k", "new"}}); }, 1, "[a]\n\tk = 1\n[p]\n\tk = new\n# note\n[b]\n"},
    {"the header's text inside a value is no header", "[a]\n\tx = [p]\n[p]\n\tk = old\n",
     [] { return Set("p", {{"k", "new"}}); }, 1, "[a]\n\tx = [p]\n[p]\n\tk = new\n"},
    {"a name holding brackets runs to the line's last one", "[p]x]\n\tk = 1\n[p]\n\tk = 2\n",
     [] { return Set("p", {{"k", "3"}}); }, 1, "[p]x]\n\tk = 1\n[p]\n\tk = 3\n"},
    {"a second section of the name goes", "[p]\n\tk = 1\n[q]\n\tk = 2\n[p]\n\tj = 3\n",
     [] { return Set("p", {{"k", "4"}}); }, 1, "[p]\n\tk = 4\n[q]\n\tk = 2\n"},
    {"a line without brackets' end does not end a section", "[p]\n\tk = 1\n[broken\n\tj = 2\n[q]\n",
     [] { return Set("p", {{"k", "3"}}); }, 1, "[p]\n\tk = 3\n[q]\n"},
    {"missing section appended after a last line without newline", "[a]\n\tk = 1",
     [] { return Set("p", {{"k", "2"}}); }, 1, "[a]\n\tk = 1\n[p]\n\tk = 2\n"},
    {"add of an existing indented section changes nothing", "\t[p]\n\tk = 1\n",
     [] { return ORLICFileAddSection(kConf, "p", Hash({{"k", "2"}}).get(), kFmt); }, 0, "\t[p]\n\tk = 1\n"},
    {"add after a prefix of the name", "[pp]\n\tk = 1\n",
     [] { return ORLICFileAddSection(kConf, "p", Hash({{"k", "2"}}).get(), kFmt); }, 1,
     "[pp]\n\tk = 1\n[p]\n\tk = 2\n"},
    {"value set on the key's last line", "[p]\n\tk = 1\n\tk = 2\n[q]\n",
     [] { return ORLICFileSetSectionValue(kConf, "p", "k", "3"); }, 0, "[p]\n\tk = 1\n\tk = 3\n[q]\n"},
    {"a new key goes after the last key of the name's last section", "[p]\n\tk = 1\n; c\n[p]\n\tj = 2",
     [] { return ORLICFileSetSectionValue(kConf, "p", "n", "3"); }, 0, "[p]\n\tk = 1\n; c\n[p]\n\tj = 2\n\tn = 3\n"},
};

TEST(SectionFile, EditsChangeOnlyTheSectionConcerned) {
    for (const EditCase &c : kEdits) {
        PlaceFile(kConf, c.before);
        EXPECT_EQ(c.edit(), c.result) << c.what;
        EXPECT_EQ(ReadFile(kConf), c.after) << c.what;
    }
}

TEST(SectionFile, ReadsMergeSectionsOfOneNameAndSkipLookalikes) {
    PlaceFile(kConf, "k = top\n[a]\n\tx = [p]\n  [p]  \n\tk = 1\n# c\n\tj = 2\n[p]x]\n\tk = no\n[p]\n\tk = 3\n");
    EXPECT_EQ(ReadSection(kConf, "p"), (Section{{"k", "3"}, {"j", "2"}}));
    char buf[16] = {};
    EXPECT_EQ(ORLICFileGetSectionValue(kConf, "p]x", "k", buf, sizeof buf), 2);
    EXPECT_STREQ(buf, "no");
}

// A setup reads the section, adds it and replaces it; what the read took
// in is used by the next calls only while the file is that same file.
TEST(SectionFile, KeptReadNeverOutlivesTheFile) {
    const std::string before = "[p]\n\tk = 1\n[q]\n\tk = 1\n";
    struct Change {
        const char *what;
        void (*change)();
        const char *after;  // the file after the replace of p; null: refused
    };
    const Change kChanges[] = {
        {"replaced by a file of the same size", [] { PlaceFile(kConf, "[p]\n\tk = 1\n[q]\n\tk = 2\n"); },
         "[p]\n\tk = 9\n[q]\n\tk = 2\n"},
        {"removed", [] { unlink(kConf); }, "[p]\n\tk = 9\n"},
        {"replaced by a symlink",
         [] {
             ASSERT_EQ(symlink("/etc/hostname", "/usr/xavo/etc/link"), 0);
             ASSERT_EQ(rename("/usr/xavo/etc/link", kConf), 0);
         },
         nullptr},
    };
    for (const Change &c : kChanges) {
        PlaceFile(kConf, before);
        EXPECT_EQ(ReadSection(kConf, "p"), (Section{{"k", "1"}})) << c.what;
        c.change();
        const int32_t added = ORLICFileAddSection(kConf, "p", Hash({{"k", "9"}}).get(), kFmt);
        if (c.after == nullptr) {
            EXPECT_LT(added, 0) << c.what;
            EXPECT_EQ(ORLICErrGet(), 0x0900u) << c.what;
            continue;
        }
        if (added == 0) {
            EXPECT_EQ(Set("p", {{"k", "9"}}), 1) << c.what;
        }
        EXPECT_EQ(ReadFile(kConf), c.after) << c.what;
    }
}

// Every platform call passes through the counters; they stay exact when
// several threads call at once.
TEST(PlatformCounters, StayExactAcrossThreads) {
    XavoStandinReset();
    constexpr int kThreads = 4, kCalls = 2000;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([] {
            for (int i = 0; i < kCalls; ++i) ORLICSzListFree(ORLICSzListAlloc(1024));
        });
    }
    for (std::thread &t : threads) t.join();
    EXPECT_EQ(XavoStandinCallCount("ORLICSzListAlloc"), kThreads * kCalls);
    EXPECT_EQ(XavoStandinCallCount("ORLICSzListFree"), kThreads * kCalls);
    EXPECT_EQ(XavoStandinCallCount("*"), kThreads * kCalls);
}

// A list asked for with a large capacity starts small and grows as it is
// pushed to, its items where the record says.
TEST(PlatformLists, GrowPastTheirFirstBlock) {
    xavo::SzList list(ORLICSzListAlloc(1024));
    for (int i = 0; i < 3000; ++i) ASSERT_GT(ORLICSzListPush(list.addr(), std::to_string(i).c_str()), 0);
    ASSERT_EQ(ORLIC_SZLIST_COUNT(list.get()), 3000);
    EXPECT_GE(list.get()->iCapacity, 3000);
    EXPECT_STREQ(ORLIC_SZLIST_ITEMS(list.get())[2999], "2999");
}

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

bool IsZombie(pid_t pid) {
    for (const SandboxProcess &p : Descendants()) {
        if (p.pid == pid) return p.state == 'Z';
    }
    return false;
}

TEST(PlatformServices, DaemonFoundLastIsCheckedAgainEveryTime) {
    ASSERT_EQ(ORLIServiceIsRunning("cupsd"), 0);
    const pid_t first = StartFakeCupsd();
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 1);
    EXPECT_EQ(ORLICIsProcAlive("cupsd"), 1) << "the same lookup, nothing remembered";
    ASSERT_EQ(kill(first, SIGKILL), 0);
    // A zombie is no running daemon, nor a reaped one.
    for (int i = 0; i < 400 && !IsZombie(first); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(5));
    ASSERT_TRUE(IsZombie(first));
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 0) << "zombie";
    EXPECT_EQ(ORLICIsProcAlive("cupsd"), 0) << "zombie";
    ASSERT_EQ(waitpid(first, nullptr, 0), first);
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 0) << "reaped";
    const pid_t second = StartFakeCupsd();
    EXPECT_EQ(ORLIServiceIsRunning("cupsd"), 1);
    kill(second, SIGKILL);
    waitpid(second, nullptr, 0);
}

}  // namespace
