// The core platform stand-in (libxavocore), for what the library's own suites drive through it but cannot
// observe: atomic replacement keeping mode and owner, no write through a symlink, lock exclusion across processes,
// and the failure controls and call counters every sweep stands on.  And its shortcuts giving the same answers as
// the long way: section operations that search for a header instead of splitting the file (where a section starts
// and ends when headers are indented, names hold brackets or a header's text turns up inside a value), a setup's
// read kept for its next calls never outliving the file it was read from, and lists that start small.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "appliance/standin_control.h"
#include "internal/guards.h"
#include "sandbox/sandbox.h"
#include "support/paths.h"
#include "support/processes.h"
#include "support/sections.h"
#include "xavocore.h"
#include "xavoprinter.h"

using ::testing::IsEmpty;
using xavo::SzHash;
using namespace xavo::test;

namespace {

constexpr char kFmt[] = "\t%s = %s\n";
constexpr char kKvFmt[] = "%s=\"%s\"\n";

SzHash Hash(const Section &keys) {
    SzHash hash(ORLICSzHashAlloc(512));
    for (const auto &[k, v] : keys) ORLICSzHashSetValue(hash.addr(), k.c_str(), v.c_str());
    return hash;
}

struct stat Stat(const char *path) {
    struct stat st {};
    EXPECT_EQ(lstat(path, &st), 0) << path;
    return st;
}

double Seconds(std::chrono::steady_clock::time_point since) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - since).count();
}

// Each writer of the platform, as a test drives it, on files in root's own
// directory: what a writer makes of a file that another user put in /tmp,
// and the mode of a new file, are pinned by the file proofs.
struct Writer {
    const char *name;
    const char *path;
    int32_t (*write)(const char *path);
};
const Writer kWriters[] = {
    {"section add", kConf,
     [](const char *p) { return ORLICFileAddSection(p, "new", Hash({{"k", "v"}}).get(), kFmt); }},
    {"section set", kConf,
     [](const char *p) { return ORLICFileSetSection(p, "p", "p", Hash({{"k", "v"}}).get(), kFmt); }},
    {"section value", kConf, [](const char *p) { return ORLICFileSetSectionValue(p, "p", "k", "v"); }},
    {"key set", kNptab, [](const char *p) { return ORLICFileSetKeyValue(p, "lp0", "1-1", kKvFmt); }},
    {"key remove", kNptab, [](const char *p) { return ORLICFileRemoveKey(p, "lp1"); }},
};
constexpr char kStartText[] = "[p]\n\tk = old\nlp1=\"x\"\n";

TEST(PlatformAtomicWrite, ReplacesTheFileKeepingModeAndOwnerButNeverThroughASymlink) {
    for (const Writer &w : kWriters) {
        SCOPED_TRACE(w.name);
        PlaceFile(w.path, kStartText, 0640);
        ASSERT_EQ(chown(w.path, 123, 456), 0);
        struct stat before = Stat(w.path);
        EXPECT_GE(w.write(w.path), 0);
        struct stat after = Stat(w.path);
        EXPECT_NE(after.st_ino, before.st_ino) << "replaced, not rewritten in place";
        EXPECT_EQ(after.st_mode & 07777, 0640u);
        EXPECT_EQ(std::to_string(after.st_uid) + ":" + std::to_string(after.st_gid), "123:456");
        PlaceFile("/tmp/victim", kStartText);
        unlink(w.path);
        ASSERT_EQ(symlink("/tmp/victim", w.path), 0);
        ORLICErrSetEx(0, "", 0);
        EXPECT_LT(w.write(w.path), 0);
        EXPECT_EQ(ORLICErrGet(), ERR_OPEN);
        EXPECT_TRUE(S_ISLNK(Stat(w.path).st_mode));
        EXPECT_EQ(ReadFile("/tmp/victim"), kStartText);
        unlink(w.path);
    }
}

TEST(PlatformLock, LockFileIsTakenOnceAndRefusedAtOnceWhileHeld) {
    const char *path = "/run/xavo-test/deep/lock_file";
    int32_t fd = -1;
    ASSERT_EQ(ORLICFileLockByFile(path, 1, &fd), 1);
    EXPECT_EQ(Stat("/run/xavo-test/deep").st_mode & 07777, 0755u);
    EXPECT_NE(fcntl(fd, F_GETFD) & FD_CLOEXEC, 0);
    auto start = std::chrono::steady_clock::now();
    int32_t other = -1;
    EXPECT_NE(ORLICFileLockByFile(path, 1, &other), 1);
    EXPECT_LT(Seconds(start), 0.1);
    close(fd);
}

TEST(PlatformLock, UsbIdMapIsHeldBetweenLockAndUnlockAcrossProcesses) {
    ASSERT_EQ(ORLICFileLock(0x20006, 15), 0);
    // A forked child does not inherit the lock: it waits its timeout and fails.
    auto start = std::chrono::steady_clock::now();
    EXPECT_TRUE(InChild([] { return ORLICFileLock(0x20006, 1) == -1 && ORLICErrGet() == 0x0400; }));
    EXPECT_GE(Seconds(start), 0.9);
    EXPECT_LT(Seconds(start), 3.0);
    ASSERT_EQ(ORLICFileUnlock(0x20000), 0);
    EXPECT_EQ(ORLICFileUnlock(0x20000), -1);
    EXPECT_EQ(ORLICErrGet(), 0x0500u);
    EXPECT_TRUE(InChild([] { return ORLICFileLock(0x20006, 15) == 0 && ORLICFileUnlock(0x20000) == 0; }));
    EXPECT_THAT(xavo::test::TakeSleeps(), IsEmpty()) << "the platform waits without sleep()/usleep()";
    EXPECT_EQ(ORLICFileLock(0x30006, 1), -1) << "unknown lock";
}

TEST(PlatformControls, FailsTheChosenCallWithItsFailureValueAndCode) {
    XavoStandinFailCall("ORLICSzHashAlloc", 2, 0x0200);
    SzHash first(ORLICSzHashAlloc(8));
    EXPECT_NE(first.get(), nullptr);
    EXPECT_EQ(ORLICSzHashAlloc(8), nullptr);
    EXPECT_EQ(ORLICErrGet(), 0x0200u);
    EXPECT_STREQ(XavoStandinLastFailed(), "ORLICSzHashAlloc");
    EXPECT_EQ(XavoStandinCallCount("ORLICSzHashAlloc"), 2);
    // "*": the nth call of any operation that can fail; lookups never fail.
    XavoStandinReset();
    XavoStandinFailCalls("*", 2, -1, 0x0900);
    EXPECT_EQ(ORLICSzHashSetValue(first.addr(), "k", "v"), 0);
    EXPECT_STREQ(ORLICSzHashGetValue(first.get(), "k"), "v");
    EXPECT_LT(ORLICFileSetKeyValue(kNptab, "lp0", "1-1", kKvFmt), 0);
    EXPECT_EQ(ORLICErrGet(), ERR_OPEN);
    EXPECT_FALSE(FileExists(kNptab));
    EXPECT_EQ(ORLICExec("/bin/true", nullptr, nullptr, nullptr, nullptr), -1);
    EXPECT_EQ(XavoStandinCallCount("*"), 3);
    EXPECT_EQ(XavoStandinCallCount("ORLICSzHashGetValue"), 1);
}

TEST(PlatformControls, FailedReleasesStillRelease) {
    FILE *out = ORLICPopen("/bin/true", "r", nullptr);
    ASSERT_NE(out, nullptr);
    ASSERT_EQ(ORLICFileLock(0x20006, 0), 0);
    XavoStandinFailCalls("*", 1, -1, 0x0500);
    EXPECT_EQ(ORLICPclose(out), -1);
    EXPECT_EQ(ORLICFileUnlock(0x20000), -1);
    EXPECT_TRUE(InChild([] { XavoStandinReset(); return ORLICFileLock(0x20006, 0) == 0; })) << "the lock was let go";
    for (const auto &p : xavo::test::Descendants()) ADD_FAILURE() << "left: " << p.pid << " " << p.state;
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
            EXPECT_EQ(ORLICErrGet(), ERR_OPEN) << c.what;
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

}  // namespace
