// Proofs of what the library's files keep from other users: a symlink
// planted at any path it writes never gets its target written, and a table
// that another user planted in /tmp is neither believed nor kept.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <functional>
#include <string>

#include "sandbox/sandbox.h"
#include "support/paths.h"
#include "support/proof_tally.h"
#include "support/records.h"
#include "xavoprinter.h"

using namespace xavo::test;

namespace {

constexpr char kUsbtabLock[] = "/tmp/.usbtab.lock";
constexpr char kPrinter[] = "04b8:0005:SN0001";
constexpr char kVictim[] = "/root/victim";
constexpr char kTmpVictim[] = "/tmp/roots-file";  // on /tmp's file system
constexpr char kVictimText[] = "lp1=\"6-6\"\n";
constexpr uid_t kNobody = 65534;

struct stat LStat(const char *szPath) {
    struct stat st {};
    if (lstat(szPath, &st) != 0) st.st_mode = 0;
    return st;
}

void PlugPrinter() {
    PlugUsbDevice({.devName = "lp0", .busId = "1-1"});
    SetUsblp("lp0", {.deviceIdReply = UsblpReply("MFG:ACME;MDL:Model 100;")});
}

// The writes of each file, as the appliance's services make them.
void SetUpUsb() {
    UsbPrinterConf conf = UsbRecord(kPrinter);
    Fill(conf.szDriver, "drv.ppd");
    XAVOPrinterConfSetup(&conf, 0);
}
void SetUpNet() {
    const NetPrinterConf net = NetRecord();
    XAVOPrinterNetConfSetup(&net, 0);
}
void UpdateNet(int32_t iAdd) {
    const NetPrinterConf net = NetRecord();
    XAVOPrinterNetUpdateConf(iAdd, &net);
}
void AddNet() { UpdateNet(1); }
void SetCloud() {
    const PrinterGoogleInfo cloud = CloudRecord("owner@example.com", "pw", "");
    XAVOPrinterGoogleInfoSet(&cloud);
}
void PlugIn() {
    PlugPrinter();
    XAVOPrinterEnableExt(1, "lp0", "1-1");
}

// ---- symlinks -------------------------------------------------------------

// Every path the library writes, itself or through the platform, with the
// operations that write it.  In /tmp the link is replaced and the operation
// works; in root's own directories the write is refused.
struct LinkCase {
    const char *szPath;
    std::function<void()> operations;
};
const LinkCase kLinkCases[] = {
    {kConf, [] { SetUpUsb(); SetUpNet(); SetCloud(); }},
    {kNptab, [] {
         UpdateNet(1);
         UpdateNet(0);
     }},
    {kSmbConf, AddNet},
    {kUsbtab, [] {
         PlugIn();
         XAVOPrinterEnableExt(0, nullptr, "1-1");
     }},
    {"/tmp/usbip_04b8:0005:SN0001", [] {
         PlaceProgram("/usr/bin/bind_driver", "#!/bin/sh\nexit 0\n");
         char buf[64];
         XAVOPrinterUsbipGetLockStatus(kPrinter, buf, sizeof buf);
         XAVOPrinterQueueGet(kPrinter, buf, sizeof buf);
         XAVOPrinterUsbipEject(kPrinter);
         XAVOPrinterUsbipLockRelease(kPrinter);
     }},
    {kCupsConf, [] { XAVOPrinterCupsUsbConfRmAll(); }},
    {"/run/xavosdk/lock/lock_printer", SetUpUsb},
    {"/run/xavosdk/lock/LOCK_USBIDMAP", PlugIn},
    {kUsbtabLock, PlugIn},
    {"/usr/xavo/etc/.printer.conf.lock", SetUpUsb},
    {"/usr/xavo/etc/.nptab.lock", AddNet},
    {"/etc/samba/.smb.reserved.conf.lock", AddNet},
    {"/usr/xavo/etc/.printer_secret.key", SetCloud},
};

// Each path with a link to an existing file, which must keep its text, and
// with a dangling link, whose target must not appear.
TEST(FileTrustProofs, SymlinkTargetsAreNeverWritten) {
    Tally tally{"symlinks"};
    for (const LinkCase &c : kLinkCases) {
        for (bool bDangling : {false, true}) {
            SCOPED_TRACE(std::string(c.szPath) + (bDangling ? " (dangling)" : ""));
            ResetSandbox();
            PlaceFile(kCupsConf, "<Printer usbprinter1>\n</Printer>\n");
            if (!bDangling) PlaceFile(kVictim, kVictimText, 0666);
            std::filesystem::create_directories(std::filesystem::path(c.szPath).parent_path());
            unlink(c.szPath);
            ASSERT_EQ(symlink(kVictim, c.szPath), 0);
            c.operations();
            EXPECT_TRUE(tally.Check(bDangling ? !FileExists(kVictim) : ReadFile(kVictim) == kVictimText));
            if (std::strncmp(c.szPath, "/tmp/.", 6) == 0 || std::strcmp(c.szPath, kUsbtab) == 0) {
                EXPECT_TRUE(tally.Check(S_ISREG(LStat(c.szPath).st_mode))) << "a link in /tmp is replaced";
            }
        }
    }
}

// ---- untrusted files in /tmp ------------------------------------------------

// Something another user (or nobody) made at the table's path or at its lock
// file's before root's first plug-in.
struct PlantCase {
    const char *szName;
    std::function<void()> plant;
};
void PlantFile(const char *szPath, uid_t uid, mode_t mode, const char *szText = kVictimText) {
    PlaceFile(szPath, szText, mode);
    ASSERT_EQ(chown(szPath, uid, uid), 0);
    ASSERT_EQ(chmod(szPath, mode), 0);
}
void PlantLink(const char *szPath) {
    PlaceFile(kVictim, kVictimText, 0666);
    ASSERT_EQ(symlink(kVictim, szPath), 0);
}
const PlantCase kPlantCases[] = {
    {"table of another user, 0666", [] { PlantFile(kUsbtab, kNobody, 0666); }},
    {"table of another user, 0644", [] { PlantFile(kUsbtab, kNobody, 0644); }},
    {"root's table that anybody may write", [] { PlantFile(kUsbtab, 0, 0666); }},
    {"table linked to a file", [] { PlantLink(kUsbtab); }},
    {"second name of root's file", [] {
         PlaceFile(kTmpVictim, kVictimText, 0644);
         ASSERT_EQ(link(kTmpVictim, kUsbtab), 0);
     }},
    {"FIFO at the table", [] { ASSERT_EQ(mkfifo(kUsbtab, 0666), 0); }},
    {"lock file of another user", [] { PlantFile(kUsbtabLock, kNobody, 0666); }},
    {"lock file linked to a file", [] { PlantLink(kUsbtabLock); }},
};

// A child that holds the flock of whatever is at the lock file's path until
// the test is done: a planted lock file must not keep root's writers out.
pid_t HoldPlantedLock() {
    int ready[2];
    if (pipe(ready) != 0) return -1;
    const pid_t pid = fork();
    if (pid == 0) {
        const int fd = open(kUsbtabLock, O_RDONLY | O_NONBLOCK);
        if (fd >= 0) flock(fd, LOCK_EX);
        (void)!write(ready[1], "x", 1);
        pause();
        _exit(0);
    }
    char c;
    (void)!read(ready[0], &c, 1);
    close(ready[0]);
    close(ready[1]);
    return pid;
}

TEST(FileTrustProofs, TablePlantedInTmpIsIgnoredAndReplacedByRootsOwn) {
    Tally tally{"untrusted tmp"};
    for (const PlantCase &c : kPlantCases) {
        SCOPED_TRACE(c.szName);
        ResetSandbox();
        SetRealSleep(true);
        PlugPrinter();
        c.plant();
        const pid_t holder = HoldPlantedLock();
        // Readers ignore it: no device listed, and nothing else is believed.
        char **names = nullptr;
        int32_t count = -1;
        EXPECT_TRUE(tally.Check(XAVOPrinterUsbtabEnum(&names, &count) == 0 && count == 0));
        std::free(names);
        EXPECT_TRUE(tally.Check(XAVOPrinterEnableExt(1, "lp0", "1-1") == 0));
        const struct stat st = LStat(kUsbtab);
        EXPECT_TRUE(tally.Check(S_ISREG(st.st_mode) && st.st_uid == 0 && (st.st_mode & 07777) == 0644));
        EXPECT_TRUE(tally.Check(ReadFile(kUsbtab) == "lp0=\"1-1\"\n")) << ReadFile(kUsbtab);
        const struct stat lock = LStat(kUsbtabLock);
        EXPECT_TRUE(tally.Check(S_ISREG(lock.st_mode) && lock.st_uid == 0 && (lock.st_mode & 077) == 0));
        for (const char *szVictim : {kVictim, kTmpVictim}) {
            if (!FileExists(szVictim)) continue;
            EXPECT_TRUE(tally.Check(ReadFile(szVictim) == kVictimText)) << szVictim;
        }
        kill(holder, SIGKILL);
        waitpid(holder, nullptr, 0);
    }
    // The status file of the USB/IP service is root's as well.
    ResetSandbox();
    PlantFile("/tmp/usbip_04b8:0005:SN0001", kNobody, 0666, "LOCK=\"Locked by 10.0.0.66\"\n");
    char status[64] = {};
    EXPECT_TRUE(tally.Check(XAVOPrinterUsbipGetLockStatus(kPrinter, status, sizeof status) == 0 &&
                            std::string(status) == "Free"));
}

}  // namespace
