// USB printers coming and going: the USB printer table, the printer's section,
// the driver's requests, the Samba share, LOCK_USBIDMAP, and the listings.
#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "internal/guards.h"
#include "sandbox/cupsd.h"
#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/paths.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using namespace xavo::test;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";
constexpr char kDeviceId[] = "MFG:ACME;MDL:Model 100 Pro;CMD:ESCPL2;";
constexpr char kUsbIdMapLock[] = "/run/xavosdk/lock/LOCK_USBIDMAP";
constexpr char kPrinterLock[] = "/run/xavosdk/lock/lock_printer";

// A printer on devName that answers the device ID request.
void Plug(const std::string &devName, const std::string &busId, const std::string &serial = "SN0001",
          const std::string &deviceId = kDeviceId) {
    PlugUsbDevice({.devName = devName, .busId = busId, .serial = serial});
    SetUsblp(devName, {.deviceIdReply = UsblpReply(deviceId)});
}

// Whether someone holds the flock() lock on the file; a descriptor of its
// own sees the holder even in the holding process.
bool Locked(const char *szPath) {
    const int fd = open(szPath, O_RDONLY | O_CLOEXEC);
    const bool busy = fd >= 0 && flock(fd, LOCK_EX | LOCK_NB) != 0;
    if (fd >= 0) close(fd);
    return busy;
}
bool NoLockLeft() { return !Locked(kUsbIdMapLock) && !Locked(kPrinterLock); }

// The test stands between the library and the platform for the calls that
// take LOCK_USBIDMAP and write files, and notes the locks held at each.
std::vector<std::string> *g_events = nullptr;

void Note(const std::string &what, const char *szPath = nullptr) {
    if (g_events == nullptr) return;
    const std::string file = szPath ? std::string(" ") + (std::strrchr(szPath, '/') + 1) : "";
    g_events->push_back(what + file + (Locked(kUsbIdMapLock) ? " +usbidmap" : "") +
                        (Locked(kPrinterLock) ? " +printer" : ""));
}

template <class Fn>
Fn Next(const char *szName) { return reinterpret_cast<Fn>(dlsym(RTLD_NEXT, szName)); }

}  // namespace

extern "C" {
int32_t ORLICFileLock(uint32_t uLock, int32_t iTimeout) {
    Note("take");
    return Next<int32_t (*)(uint32_t, int32_t)>("ORLICFileLock")(uLock, iTimeout);
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
    // printer lock, taken inside it; the share after both are released.
    EXPECT_THAT(events, ElementsAre("take", "set usbtab +usbidmap", "add printer.conf +usbidmap +printer",
                                    "add smb.reserved.conf"));
    EXPECT_EQ(ReadFile(kUsbtab), "lp0=\"1-1\"\n");
    EXPECT_EQ(ReadSection(kConf, kPrinter), (Section{{"producer", "ACME"}, {"product name", "Model 100 Pro"},
                                                     {"mode", "usbip"}, {"usblp string id", kDeviceId}}));
    EXPECT_EQ(GetUsblp("lp0").requests.back(), 0x40005008u);
    EXPECT_EQ(ReadSection(kSmbConf, "printers"),
              (Section{{"comment", "All Printers"}, {"path", "/var/services/printer"}, {"browseable", "no"},
                       {"public", "yes"}, {"guest ok", "yes"}, {"writable", "yes"}, {"printable", "yes"}}));
    EXPECT_EQ(std::system("/usr/bin/testparm -s /etc/samba/smb.reserved.conf >/tmp/testparm.out 2>&1"), 0)
        << ReadFile("/tmp/testparm.out");
    EXPECT_TRUE(Logs().empty());
}

// Plugged in again: other keys and a mode other than LPR stay; the model is MDL's, else DES's, else the USB library's.
TEST(UsbPrinterPlugIn, ReplugKeepsOtherKeysAndTakesTheModelFromMdlThenDesThenTheUsbLibrary) {
    struct {
        const char *szStoredMode, *szDeviceId, *szMode, *szModel;
    } cases[] = {
        {"", kDeviceId, "usbip", "Model 100 Pro"},        {"LPR", kDeviceId, "usbip", "Model 100 Pro"},
        {"custom", kDeviceId, "custom", "Model 100 Pro"}, {"", "DES:Desc;MDL:Real;", "usbip", "Real"},
        {"", "MFG:A;DES:Desc", "usbip", "Desc"},          {"", "mdl:lower;", "usbip", "Model 100"},
        {"", "CLS;MDL:Inner;", "usbip", "Inner"},  // "MDL:" anywhere, unlike the pair walk
        {"", "", "usbip", "Model 100"},  // logged as a bad parameter
    };
    for (const auto &c : cases) {
        ResetSandbox();
        Section section = {{"cups printer name", "usbprinter1"}, {"driver", "x.ppd"}, {"product name", "Old"}};
        if (*c.szStoredMode) section["mode"] = c.szStoredMode;
        WriteSection(kConf, kPrinter, section);
        Plug("lp0", "1-1", "SN0001", c.szDeviceId);
        ASSERT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0);
        Section s = ReadSection(kConf, kPrinter);
        std::erase_if(s, [](const auto &kv) { return kv.first == "producer" || kv.first == "usblp string id"; });
        section["mode"] = c.szMode;
        section["product name"] = c.szModel;
        EXPECT_EQ(s, section) << c.szStoredMode << " " << c.szDeviceId;
        EXPECT_EQ(Logs(), *c.szDeviceId ? std::vector<std::string>{}
                                        : std::vector<std::string>{"3 printer_enable_ext:N Bad parameter"});
    }
}

TEST(UsbPrinterUnplug, RemovesOnlyTheLinesNamedAndAsksOnlyANamedDevice) {
    const std::string all = "lp0=\"1-1.4\"\nlp1=\"2-1a\"\nsd1=\"1-1\"\n";
    const std::string noBusId = "3 printer_enable_ext:N delete printer failed: no bus id";
    struct {
        const char *szDevName, *szBusId;
        int32_t result;
        std::string after;
    } cases[] = {
        {nullptr, "1-1", 0, "lp1=\"2-1a\"\nsd1=\"1-1\"\n"},  // a prefix, printer lines only
        {nullptr, "2-1A", 0, "lp0=\"1-1.4\"\nsd1=\"1-1\"\n"},  // case ignored
        {nullptr, "3-1", 0, all},
        {"lp0", nullptr, 0, "lp1=\"2-1a\"\nsd1=\"1-1\"\n"},
        {"lp1", "", 0, "lp0=\"1-1.4\"\nsd1=\"1-1\"\n"},  // empty bus ID: that device only
        {nullptr, "", -1, all},  // logged
    };
    for (const auto &c : cases) {
        ResetSandbox();
        SetUsblp("lp0", UsblpConfig{});
        PlaceFile(kUsbtab, all);
        EXPECT_EQ(XAVOPrinterEnableExt(0, c.szDevName, c.szBusId), c.result);
        EXPECT_EQ(ReadFile(kUsbtab), c.after) << c.szDevName << " " << c.szBusId;
        EXPECT_EQ(Logs(), std::vector<std::string>(c.result ? 1 : 0, noBusId));
        const bool lp0 = c.szDevName && !std::strcmp(c.szDevName, "lp0");
        EXPECT_EQ(GetUsblp("lp0").requests, std::vector<std::uint32_t>(lp0 ? 1 : 0, 0x40005007)) << "disable request";
    }
}

TEST(UsbPrinterPlugIn, RefusesBadArgumentsBeforeTheLockAndDevicesBeyondLp1After) {
    const std::string exceed = "3 printer_enable_ext:N Exceed the max number of printers supported.";
    struct {
        const char *szDevName, *szBusId;
        bool beyond;     // else a bad argument
        bool underLock;  // refused once LOCK_USBIDMAP is taken
    } cases[] = {{"lp0", nullptr, false, false}, {"", "1-1", false, false}, {"lp2", "1-3", true, true},
                 {"lp10", "1-3", true, true}, {"lp1", "1-1\"\nlp0=\"9", false, true}};  // a line break: at the table
    for (const auto &c : cases) {
        XavoStandinReset();
        EXPECT_EQ(XAVOPrinterEnableExt(1, c.szDevName, c.szBusId), c.beyond ? 0 : -1);
        if (c.beyond) {
            EXPECT_THAT(Logs(), ElementsAre(exceed));
        } else {
            EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
        }
        EXPECT_EQ(XavoStandinCallCount("ORLICFileLock"), c.underLock ? 1 : 0);
        EXPECT_FALSE(FileExists(kUsbtab));
        EXPECT_FALSE(FileExists(kConf));
        EXPECT_TRUE(NoLockLeft());
        Logs();
    }
}

// Each failing platform call gives -1 and its code, or is survived (an unreadable section is written anew, an
// unreadable table has nothing to remove, a busy lock is tried again, a failed release is logged and released once
// more); none leaves a lock held or the device open.
TEST(UsbPrinterPlatformFailures, EnableAndRemovalFailCleanly) {
    const std::set<std::string> survived = {"ORLICFileGetSection", "ORLICFileGetPair", "ORLICFileLockByFile",
                                            "ORLICFileUnlock"};
    const std::map<std::string, std::uint32_t> ownCodes = {{"ORLICFileLock", ERR_LOCK},
        {"ORLICSzHashAlloc", ERR_OUT_OF_MEMORY}, {"ORLICSzListAlloc", ERR_OUT_OF_MEMORY},
        {"ORLICSzHashSetValue", ERR_OUT_OF_MEMORY}};
    auto check = [&](const std::string &failed, int32_t result) {
        EXPECT_EQ(result, survived.count(failed) ? 0 : -1);
        if (result != 0) {
            EXPECT_EQ(ORLICErrGet(), ownCodes.count(failed) ? ownCodes.at(failed) : kInjectedCode);
        }
        if (failed == "ORLICFileUnlock") {
            EXPECT_THAT(Logs(), ::testing::Contains("3 printer_enable_ext:N unlock LOCK_USBIDMAP failed"));
        }
        EXPECT_TRUE(NoLockLeft());
        EXPECT_EQ(GetUsblp("lp0").openNow, 0);
    };
    // A section kept from an earlier plug-in: the setup rewrites it, so that
    // every platform call of the section's merge and rewrite is failed too.
    SweepFailures(
        [] {
            Plug("lp0", "1-1");
            WriteSection(kConf, kPrinter, {{"mode", "lpr"}, {"driver", "x.ppd"}});
        },
        [] { return XAVOPrinterEnableExt(1, "lp0", "1-1"); }, check);
    SweepFailures([] { PlaceFile(kUsbtab, "lp0=\"1-1\"\nlp1=\"1-1.2\"\n"); },
                  [] { return XAVOPrinterEnableExt(0, nullptr, "1-1"); }, check);
}

TEST(UsbPrinterListing, DeviceNamesIdsAndCountsFollowTheTable) {
    Plug("lp0", "1-1");
    Plug("lp1", "1-2", "");  // no serial: the USB library gives no printer ID
    PlaceFile(kUsbtab, "lp0=\"1-1\"\nlp1=\"1-2\"\n");
    PlaceFile(kNptab, "10.0.0.5=\"office\"\n");
    char **names = static_cast<char **>(std::malloc(8));  // an earlier array, released by the call
    int32_t count = -1;
    ASSERT_EQ(XAVOPrinterUsbtabEnum(&names, &count), 0);
    EXPECT_EQ(std::vector<std::string>(names, names + count), (std::vector<std::string>{"lp0", "lp1"}));
    std::free(names);
    ORLICSzList *list = ORLICSzListAlloc(256);
    ORLICSzListPush(&list, "replaced");
    EXPECT_EQ(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET | 4, &list), 2);
    EXPECT_EQ(Items(list), (std::vector<std::string>{kPrinter, "10.0.0.5-office"}));
    ORLICSzListFree(list);
    EXPECT_EQ(XAVOPrinterEnumCount(0, nullptr), 0);
    EXPECT_EQ(XAVOPrinterUsbtabEnum(nullptr, &count), -1);
    EXPECT_EQ(XAVOPrinterProcUsbtabIdEnum(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
}

// A section name is only text: a serial number that would make a path or a
// file name pattern still registers the printer (only its kept PPD copy is
// refused, by the queue creation).  The USB library keeps serial numbers of
// up to 127 characters; with vendor and product before it the ID is cut to
// 127, and a caller that learns the ID from a listing must find the section
// and get the queue.
class UnusualSerial : public ::testing::Test {
protected:
    void TearDown() override { Cupsd::Stop(); }
};

TEST_F(UnusualSerial, IsListedUnderItsSectionsNameAndALongOneGetsItsQueue) {
    std::string longSerial;
    for (int i = 0; longSerial.size() < 127; ++i) longSerial += std::to_string(i % 10);
    const std::string longId = ("04b8:0005:" + longSerial).substr(0, 127);
    const std::vector<std::string> serials = {"SN*", "SN?1", "SN[0]1", "../../../tmp/x", "a/b", longSerial};
    for (const std::string &serial : serials) {
        ResetSandbox();
        const std::string id = ("04b8:0005:" + serial).substr(0, 127);
        Plug("lp0", "1-1", serial);
        ASSERT_EQ(XAVOPrinterEnableExt(1, "lp0", "1-1"), 0) << serial;
        EXPECT_EQ(ReadSection(kConf, id).at("mode"), "usbip") << serial;
        xavo::SzList list;
        ASSERT_EQ(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB, list.addr()), 1) << serial;
        EXPECT_THAT(Items(list.get()), ElementsAre(id));
    }

    Cupsd::Start();
    ASSERT_EQ(XAVOPrinterCupsAdd(longId.c_str(), nullptr), 0);
    char szName[64] = {};
    ASSERT_EQ(XAVOPrinterCupsNameGet(longId.c_str(), szName, sizeof szName), 0);
    EXPECT_STREQ(szName, "usbprinter1");
    EXPECT_EQ(Queue("usbprinter1").deviceUri, "usb:/dev/usb/" + longId);
}

}  // namespace
