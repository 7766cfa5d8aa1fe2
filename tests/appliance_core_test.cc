// The core platform stand-in (libxavocore), only for what the library's own suites drive through it but cannot
// observe: atomic replacement keeping mode and owner, no write through a symlink, lock exclusion across processes,
// and the failure controls every sweep stands on.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <string>
#include <utility>
#include <vector>

#include "appliance/standin_control.h"
#include "internal/guards.h"
#include "sandbox/sandbox.h"
#include "support/paths.h"
#include "support/processes.h"
#include "xavocore.h"

using ::testing::IsEmpty;
using xavo::SzHash;
using namespace xavo::test;

namespace {

constexpr char kFmt[] = "\t%s = %s\n";
constexpr char kKvFmt[] = "%s=\"%s\"\n";

SzHash MakeHash(const std::vector<std::pair<std::string, std::string>> &pairs) {
    SzHash hash(ORLICSzHashAlloc(512));
    for (const auto &[k, v] : pairs) ORLICSzHashSetValue(hash.addr(), k.c_str(), v.c_str());
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
     [](const char *p) { return ORLICFileAddSection(p, "new", MakeHash({{"k", "v"}}).get(), kFmt); }},
    {"section set", kConf,
     [](const char *p) { return ORLICFileSetSection(p, "p", "p", MakeHash({{"k", "v"}}).get(), kFmt); }},
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
        EXPECT_EQ(ORLICErrGet(), 0x0900u);
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
    EXPECT_EQ(ORLICErrGet(), 0x0900u);
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

}  // namespace
