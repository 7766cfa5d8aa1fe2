// USB printers coming and going: the USB printer table, the printer's
// section, the driver's requests, the Samba share, LOCK_USBIDMAP, and the
// listings built on the table.
#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::Contains;
using ::testing::ElementsAre;
using namespace xavo::test;

namespace {

constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kUsbtab[] = "/tmp/usbtab";
constexpr char kSmbConf[] = "/etc/samba/smb.reserved.conf";
constexpr char kPrinter[] = "04b8:0005:SN0001";
constexpr char kDeviceId[] = "MFG:ACME;MDL:Model 100 Pro;CMD:ESCPL2;";

// A printer on devName that answers the device ID request.
void Plug(const std::string &devName, const std::string &busId, const std::string &serial = "SN0001",
          const std::string &deviceId = kDeviceId) {
    PlugUsbDevice({.devName = devName, .busId = busId, .serial = serial});
    SetUsblp(devName, {.deviceIdReply = UsblpReply(deviceId)});
}

// Whether someone holds the flock() lock on the file; a descriptor of its
// own sees the holder even in the holding process.
bool Locked(const char *szPath) {
    int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    if (fd < 0) return false;
    bool busy = flock(fd, LOCK_EX | LOCK_NB) != 0;
    close(fd);
    return busy;
}
bool Locked(bool &usbIdMap, bool &printer) {
    usbIdMap = Locked("/run/xavosdk/lock/LOCK_USBIDMAP");
    printer = Locked("/run/xavosdk/lock/lock_printer");
    return usbIdMap || printer;
}
bool NoLockLeft() {
    bool a, b;
    return !Locked(a, b);
}

// The test stands between the library and the platform for the calls that
// take LOCK_USBIDMAP and write files, and notes the locks held at each.
std::vector<std::string> *g_events = nullptr;

void Note(const std::string &what, const char *szPath = nullptr) {
    if (g_events == nullptr) return;
    bool usbIdMap, printer;
    Locked(usbIdMap, printer);
    std::string file = !szPath ? "" : std::strcmp(szPath, kUsbtab) == 0 ? " usbtab" : std::strcmp(szPath, kConf) == 0 ? " conf" : " smb";
    g_events->push_back(what + file + (usbIdMap ? " +usbidmap" : "") + (printer ? " +printer" : ""));
}

template <class Fn>
Fn Next(const char *szName) {
    return reinterpret_cast<Fn>(dlsym(RTLD_NEXT, szName));
}

}  // namespace

extern "C" {
int32_t ORLICFileLock(uint32_t uLock, int32_t iTimeout) {
    Note("take");
    return Next<int32_t (*)(uint32_t, int32_t)>("ORLICFileLock")(uLock, iTimeout);
}
int32_t ORLICFileUnlock(uint32_t uLock) {
    int32_t r = Next<int32_t (*)(uint32_t)>("ORLICFileUnlock")(uLock);
    Note("released");
    return r;
}
int32_t ORLICFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue, const char *szFormat) {
    Note("set", szPath);
    return Next<decltype(&ORLICFileSetKeyValue)>("ORLICFileSetKeyValue")(szPath, szKey, szValue, szFormat);
}
int32_t ORLICFileAddSection(const char *szPath, const char *szName, const ORLICSzHash *pHash, const char *szFormat) {
    Note("add", szPath);
    return Next<decltype(&ORLICFileAddSection)>("ORLICFileAddSection")(szPath, szName, pHash, szFormat);
}
}

namespace {

TEST(UsbPrinterPlugIn, WritesTableSectionRequestAndShareInLockOrder) {
    Plug("lp0", "1-1");
    std::vector<std::string> events;
    g_events = &events;
    EXPECT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0);
    g_events = nullptr;
    // Table and section under LOCK_USBIDMAP, the section also under the
    // printer lock, taken inside it; the share after it.
    EXPECT_THAT(events, ElementsAre("take", "set usbtab +usbidmap", "add conf +usbidmap +printer", "released", "add smb"));
    EXPECT_EQ(ReadFile(kUsbtab), "lp0=\"1-1\"\n");
    EXPECT_EQ(ReadSection(kConf, kPrinter), (Section{{"producer", "ACME"},
                                                     {"product name", "Model 100 Pro"},
                                                     {"mode", "usbip"},
                                                     {"usblp string id", kDeviceId}}));
    EXPECT_EQ(GetUsblp("lp0").requests.back(), 0x40005008u);
    EXPECT_EQ(GetUsblp("lp0").openNow, 0);
    EXPECT_EQ(ReadSection(kSmbConf, "printers"),
              (Section{{"comment", "All Printers"}, {"path", "/var/services/printer"}, {"browseable", "no"},
                       {"public", "yes"}, {"guest ok", "yes"}, {"writable", "yes"}, {"printable", "yes"}}));
    EXPECT_EQ(std::system("/usr/bin/testparm -s /etc/samba/smb.reserved.conf >/tmp/testparm.out 2>&1"), 0)
        << ReadFile("/tmp/testparm.out");
    EXPECT_TRUE(Logs().empty());
    EXPECT_TRUE(NoLockLeft());
}

TEST(UsbPrinterPlugIn, ReplugKeepsOtherKeysAndMovesOnlyLprToUsbip) {
    for (auto [stored, mode] : {std::pair{"", "usbip"}, std::pair{"LPR", "usbip"}, std::pair{"custom", "custom"}}) {
        ResetSandbox();
        Section section = {{"cups printer name", "usbprinter1"}, {"driver", "x.ppd"}, {"product name", "Old"}};
        if (*stored) section["mode"] = stored;
        WriteSection(kConf, kPrinter, section);
        Plug("lp0", "1-1");
        ASSERT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0);
        section.insert({{"producer", "ACME"}, {"usblp string id", kDeviceId}});
        section["mode"] = mode;
        section["product name"] = "Model 100 Pro";
        EXPECT_EQ(ReadSection(kConf, kPrinter), section) << stored;
    }
}

TEST(UsbPrinterPlugIn, ModelFromMdlThenDesThenTheUsbLibrary) {
    for (auto [deviceId, model] : {std::pair{"DES:Desc;MDL:Real;", "Real"}, std::pair{"MFG:A;DES:Desc", "Desc"},
                                   std::pair{"mdl:lower;", "Model 100"}, std::pair{"", "Model 100"}}) {
        ResetSandbox();
        Plug("lp0", "1-1", "SN0001", deviceId);
        ASSERT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0);
        EXPECT_EQ(ReadSection(kConf, kPrinter)["product name"], model) << deviceId;
        if (!*deviceId) {
            EXPECT_THAT(Logs(), ElementsAre("3 printer_enable_ext:N Bad parameter"));
        }
    }
}

TEST(UsbPrinterUnplug, RemovesOnlyTheLinesNamedAndAsksOnlyANamedDevice) {
    const std::string all = "lp0=\"1-1.4\"\nlp1=\"2-1a\"\nsd1=\"1-1\"\n";
    const std::string noBusId = "3 printer_enable_ext:N delete printer failed: no bus id";
    struct {
        const char *szDevName, *szBusId;
        int32_t result;
        std::string after, log;
    } cases[] = {
        {nullptr, "1-1", 0, "lp1=\"2-1a\"\nsd1=\"1-1\"\n", ""},  // a prefix, printer lines only
        {nullptr, "2-1A", 0, "lp0=\"1-1.4\"\nsd1=\"1-1\"\n", ""},  // case ignored
        {nullptr, "3-1", 0, all, ""},
        {"lp0", nullptr, 0, "lp1=\"2-1a\"\nsd1=\"1-1\"\n", ""},
        {"lp1", "", 0, "lp0=\"1-1.4\"\nsd1=\"1-1\"\n", ""},  // empty bus ID: that device only
        {nullptr, nullptr, -1, all, noBusId},
        {nullptr, "", -1, all, noBusId},
    };
    for (const auto &c : cases) {
        ResetSandbox();
        SetUsblp("lp0", UsblpConfig{});
        PlaceFile(kUsbtab, all);
        EXPECT_EQ(XAVOPrinterEnableExt(0, c.szDevName, c.szBusId), c.result);
        EXPECT_EQ(ReadFile(kUsbtab), c.after) << (c.szDevName ? c.szDevName : "-") << " " << (c.szBusId ? c.szBusId : "-");
        EXPECT_EQ(Logs(), c.log.empty() ? std::vector<std::string>{} : std::vector<std::string>{c.log});
        EXPECT_EQ(GetUsblp("lp0").requests, c.szDevName && !std::strcmp(c.szDevName, "lp0")
                                                ? std::vector<std::uint32_t>{0x40005007}
                                                : std::vector<std::uint32_t>{});
        EXPECT_TRUE(NoLockLeft());
    }
    ResetSandbox();
    EXPECT_EQ(XAVOPrinterEnableExt(0, nullptr, "1-1"), 0);  // no table
    EXPECT_FALSE(FileExists(kUsbtab));
}

TEST(UsbPrinterPlugIn, RefusesBadArgumentsBeforeTheLockAndDevicesBeyondLp1After) {
    const std::string exceed = "3 printer_enable_ext:N Exceed the max number of printers supported.";
    struct {
        const char *szDevName, *szBusId;
        bool beyond;  // else a bad argument
    } cases[] = {{"lp0", "", false},      {"lp0", nullptr, false},           {nullptr, "1-1", false},
                 {"", "1-1", false},       {"lp1", "1-1\"\nlp0=\"9", false}, {"lp2", "1-3", true},
                 {"lp10", "1-3", true}};
    for (const auto &c : cases) {
        XavoStandinReset();
        EXPECT_EQ(XAVOPrinterEnableExt(1, c.szDevName, c.szBusId), c.beyond ? 0 : -1);
        if (c.beyond) {
            EXPECT_THAT(Logs(), ElementsAre(exceed));
        } else {
            EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        }
        // A line break in the bus ID is caught at the table, under the lock.
        const bool underLock = c.beyond || (c.szBusId && std::strchr(c.szBusId, '\n'));
        EXPECT_EQ(XavoStandinCallCount("ORLICFileLock"), underLock ? 1 : 0);
        EXPECT_FALSE(FileExists(kUsbtab));
        EXPECT_FALSE(FileExists(kConf));
        EXPECT_TRUE(NoLockLeft());
        Logs();
    }
}

TEST(UsbPrinterPlugIn, HostileDeviceTextsAddNoKeyNoSection) {
    // Brackets and "=" in the serial number: one section that reads back.
    // Line breaks in the device ID: one value.
    Plug("lp0", "1-1", "A]B=C[D", "MFG:X;\n[evil]\nmode = lpr\r\nMDL:Y;");
    for (int plug = 0; plug < 2; ++plug) {
        ASSERT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0);
        const Section s = ReadSection(kConf, "04b8:0005:A]B=C[D");
        EXPECT_EQ(s.size(), 4u);
        EXPECT_EQ(s.at("mode"), "usbip");
        EXPECT_EQ(s.at("product name"), "Y");
        EXPECT_TRUE(ReadSection(kConf, "evil").empty());
    }
    EXPECT_EQ(ReadFile(kUsbtab), "lp0=\"1-1\"\n");
}

TEST(UsbPrinterPlugIn, TwoProcessesPluggingAtOnceBothGetLineAndSection) {
    SetRealSleep(true);
    Plug("lp0", "1-1", "SN0001");
    Plug("lp1", "1-2", "SN0002");
    int go[2];
    ASSERT_EQ(pipe(go), 0);
    pid_t children[2];
    for (int i = 0; i < 2; ++i) {
        if ((children[i] = fork()) == 0) {
            close(go[1]);
            char c;
            (void)!read(go[0], &c, 1);  // both start when the pipe closes
            _exit(XAVOPrinterEnableExt(1, i ? "lp1" : "lp0", i ? "1-2" : "1-1") == 0 ? 0 : 1);
        }
    }
    close(go[0]);
    close(go[1]);
    for (pid_t pid : children) {
        int status = 0;
        ASSERT_EQ(waitpid(pid, &status, 0), pid);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    }
    const std::string table = ReadFile(kUsbtab);
    EXPECT_TRUE(table == "lp0=\"1-1\"\nlp1=\"1-2\"\n" || table == "lp1=\"1-2\"\nlp0=\"1-1\"\n") << table;
    EXPECT_EQ(ReadSection(kConf, "04b8:0005:SN0001").at("mode"), "usbip");
    EXPECT_EQ(ReadSection(kConf, "04b8:0005:SN0002").at("mode"), "usbip");
}

// Each failing platform call gives its result and code, and leaves no lock
// held and no device open.
TEST(UsbPrinterPlatformFailures, EnableAndRemovalFailCleanly) {
    const std::map<std::string, std::pair<int32_t, std::uint32_t>> outcomes = {
        {"ORLICFileLock", {-1, ERR_LOCK}},
        {"ORLICSzHashAlloc", {-1, ERR_OUT_OF_MEMORY}},
        {"ORLICSzListAlloc", {-1, ERR_OUT_OF_MEMORY}},
        {"ORLICSzHashSetValue", {-1, ERR_OUT_OF_MEMORY}},
        {"ORLICFileSetKeyValue", {-1, kInjectedCode}},
        {"XAVOUSBDevGetInfo", {-1, kInjectedCode}},
        {"ORLICFileAddSection", {-1, kInjectedCode}},
        {"ORLICSzHashEnumKey", {-1, kInjectedCode}},
        {"ORLICFileRemoveKey", {-1, kInjectedCode}},
        {"ORLICFileGetSection", {0, 0}},  // written anew
        {"ORLICFileGetPair", {0, 0}},     // nothing to remove
        {"ORLICFileLockByFile", {0, 0}},  // tried again
        {"ORLICFileUnlock", {0, 0}},      // logged, released once more
    };
    auto check = [&](const std::string &failed, int32_t result) {
        auto it = outcomes.find(failed);
        ASSERT_NE(it, outcomes.end()) << "unexpected failing call";
        EXPECT_EQ(result, it->second.first);
        if (result != 0) {
            EXPECT_EQ(ORLICErrGet(), it->second.second);
        }
        std::vector<std::string> logs = Logs();
        if (failed == "ORLICFileUnlock") {
            EXPECT_THAT(logs, Contains("3 printer_enable_ext:N unlock LOCK_USBIDMAP failed"));
        }
        EXPECT_TRUE(NoLockLeft());
        EXPECT_EQ(GetUsblp("lp0").openNow, 0);
    };
    SweepFailures([] { Plug("lp0", "1-1"); }, [] { return XAVOPrinterEnableExt(1, "lp0", "1-1"); }, check);
    SweepFailures([] { PlaceFile(kUsbtab, "lp0=\"1-1\"\nlp1=\"1-1.2\"\n"); },
                  [] { return XAVOPrinterEnableExt(0, nullptr, "1-1"); }, check);
}

TEST(UsbPrinterListing, DeviceNamesIdsAndCountsFollowTheTable) {
    Plug("lp0", "1-1");
    Plug("lp1", "1-2", "");  // no serial: the USB library gives no printer ID
    PlaceFile(kUsbtab, "lp0=\"1-1\"\nlp1=\"1-2\"\n");
    PlaceFile("/usr/xavo/etc/nptab", "10.0.0.5=\"office\"\n");

    char **names = static_cast<char **>(std::malloc(8));  // an earlier array, released by the call
    int32_t count = -1;
    ASSERT_EQ(XAVOPrinterUsbtabEnum(&names, &count), 0);
    ASSERT_EQ(count, 2);
    EXPECT_STREQ(names[0], "lp0");
    EXPECT_STREQ(names[1], "lp1");
    std::free(names);

    ORLICSzList *list = ORLICSzListAlloc(256);
    ORLICSzListPush(&list, "replaced");
    EXPECT_EQ(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET | 4, &list), 2);
    ASSERT_EQ(ORLIC_SZLIST_COUNT(list), 2);
    EXPECT_STREQ(ORLICSzListGet(list, 0), kPrinter);
    EXPECT_STREQ(ORLICSzListGet(list, 1), "10.0.0.5-office");
    ORLICSzListFree(list);
    EXPECT_EQ(XAVOPrinterEnumCount(0, nullptr), 0);
    EXPECT_EQ(XAVOPrinterUsbtabEnum(nullptr, &count), -1);
    EXPECT_EQ(XAVOPrinterProcUsbtabIdEnum(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
}

}  // namespace
