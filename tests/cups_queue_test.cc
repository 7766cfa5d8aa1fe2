// CUPS queues against a real scheduler: what the library creates, finds and
// removes is asked of CUPS itself through lpstat, never of the library.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "sandbox/cupsd.h"
#include "support/logs.h"
#include "support/paths.h"
#include "support/records.h"
#include "xavoprinter.h"

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kA[] = "04b8:0005:SN0001";
constexpr char kB[] = "04b8:0005:SN0002";
// As small a driver file as the scheduler accepts.
constexpr char kPpdText[] =
    "*PPD-Adobe: \"4.3\"\n*FormatVersion: \"4.3\"\n*LanguageVersion: English\n*LanguageEncoding: ISOLatin1\n"
    "*Manufacturer: \"ACME\"\n*ModelName: \"ACME Model 100\"\n*NickName: \"ACME Model 100\"\n";

std::string StoredName(const char *szPrinterId) {
    char szName[64] = {};
    ORLICFileGetSectionValue(kConf, szPrinterId, "cups printer name", szName, sizeof szName);
    return szName;
}

std::string HostName() {
    char szHost[64] = {};
    gethostname(szHost, sizeof szHost - 1);
    return szHost;
}

void Lpadmin(const std::string &queue, const std::string &uri) {
    int status = -1;
    Tool({"/usr/sbin/lpadmin", "-p", queue, "-E", "-v", uri}, &status);
    ASSERT_EQ(status, 0) << queue;
}

}  // namespace

XAVO_SANDBOX_PER_SUITE(CupsQueues);

// One scheduler for the whole suite; every test starts from an empty queue
// list and an empty printer configuration.
class CupsQueues : public ::testing::Test {
protected:
    void SetUp() override {
        Cupsd::Start();
        ASSERT_GT(Cupsd::Pid(), 0) << ReadFile("/tmp/cupsd.out");
        Cupsd::RemoveAllQueues();
        Tool({"/bin/sh", "-c", "rm -f /usr/xavo/etc/nptab /etc/cups/ppd/*"});
        // The printers' sections, as registering them left them.
        PlaceFile(kConf, std::string("[") + kA + "]\n\tproducer = ACME\n\n[" + kB +
                                         "]\n\tproducer = ACME\n\n[10.0.0.11-office]\n\tip = 10.0.0.11\n");
        ORLICErrSetEx(0, "", 0);
        Logs();
        TakeSleeps();
    }
    static void TearDownTestSuite() { Cupsd::Stop(); }
};

TEST_F(CupsQueues, FirstUsbPrinterGetsDisabledQueueAndAliasSecondGetsUsbprinter2) {
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_EQ(StoredName(kA), "usbprinter1");
    for (const char *queue : {"usbprinter1", "usbprinter"}) {
        QueueInfo q = Queue(queue);
        EXPECT_FALSE(q.enabled) << queue;
        EXPECT_EQ(q.deviceUri, std::string("usb:/dev/usb/") + kA) << queue;
        EXPECT_EQ(q.location, HostName()) << queue;
    }
    // Disabling "usbprinter1" also tries the alias, which the second pass
    // only creates afterwards.
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_cups_name_get:N get cups printer name failed"),
                                    "3 printer_cups_printer_add:N add cups printer=usbprinter1, ok",
                                    StartsWith("3 printer_cups_printer_enable:N run cmd failed, "
                                               "cmd=[/usr/bin/cupsdisable usbprinter], ret="),
                                    std::string("3 printer_cups_printer_add:N disable printer=") + kA + " failed",
                                    "3 printer_cups_printer_add:N add cups printer=usbprinter, ok"));

    ASSERT_EQ(XAVOPrinterCupsAdd(kB, nullptr), 0);
    EXPECT_EQ(StoredName(kB), "usbprinter2");
    EXPECT_EQ(Queue("usbprinter2").deviceUri, std::string("usb:/dev/usb/") + kB);
    EXPECT_EQ(Queue("usbprinter").deviceUri, std::string("usb:/dev/usb/") + kA);
    // Both names taken: nothing changes for a third printer.
    EXPECT_EQ(XAVOPrinterCupsAdd("04b8:0005:SN0003", nullptr), -1);
    EXPECT_EQ(StoredName("04b8:0005:SN0003"), "");
}

TEST_F(CupsQueues, StoredNameIsKeptUnlessCupsHoldsItForAnotherDevice) {
    Lpadmin("usbprinter1", "usb:/dev/usb/other:device");
    ORLICFileSetSectionValue(kConf, kA, "cups printer name", "usbprinter1");
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_EQ(StoredName(kA), "usbprinter2");
    EXPECT_EQ(Queue("usbprinter1").deviceUri, "usb:/dev/usb/other:device");
    // Its own queue, listed under the stored name: the name stays and the
    // queue is made again, without an alias.
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_EQ(StoredName(kA), "usbprinter2");
    EXPECT_FALSE(Queue("usbprinter").exists);
}

TEST_F(CupsQueues, GivenPpdIsKeptByPrinterIdAndServesLaterCreations) {
    PlaceFile("/tmp/model.ppd", kPpdText);
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, "/tmp/model.ppd"), 0);
    EXPECT_EQ(ReadFile(std::string("/etc/cups/ppd/") + kA + ".ppd"), kPpdText);
    EXPECT_TRUE(FileExists("/etc/cups/ppd/usbprinter1.ppd"));  // CUPS's own copy of the queue's driver
    EXPECT_FALSE(FileExists("/etc/cups/ppd/usbprinter.ppd"));  // the alias has none
    ASSERT_EQ(XAVOPrinterCupsRm(kA), 0);
    unlink("/tmp/model.ppd");
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    EXPECT_TRUE(FileExists("/etc/cups/ppd/usbprinter1.ppd"));

    EXPECT_EQ(XAVOPrinterCupsAdd(kB, "/tmp/missing.ppd"), -1);
    EXPECT_THAT(Logs(), Contains("3 printer_cups_printer_add:N add cups printer, ppd file does not exist,"
                                 "path=/tmp/missing.ppd"));
    EXPECT_EQ(StoredName(kB), "usbprinter2");
    EXPECT_FALSE(Queue("usbprinter2").exists);
}

TEST_F(CupsQueues, NetworkQueueIsCreatedEnabledWithItsPpd) {
    PlaceFile("/tmp/model.ppd", kPpdText);
    NetPrinterConf conf = NetRecord("10.0.0.11", "office", "socket");
    ASSERT_EQ(XAVOPrinterNetCupsAdd(&conf, "/tmp/model.ppd"), 0);
    QueueInfo q = Queue("office");
    EXPECT_TRUE(q.enabled);
    EXPECT_EQ(q.deviceUri, "socket://10.0.0.11/");
    EXPECT_EQ(q.location, HostName());
    EXPECT_TRUE(FileExists("/etc/cups/ppd/office.ppd"));
    EXPECT_EQ(ReadFile("/etc/cups/ppd/10.0.0.11-office.ppd"), kPpdText);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_net_cups_add:N add cups network printer=office, ok"));
    conf = NetRecord("10.0.0.12", "", "lpd", "raw");
    EXPECT_EQ(XAVOPrinterNetCupsAdd(&conf, nullptr), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_net_cups_add:N cannot find cups printer name, printer=10.0.0.12-"));
}

// Name and address lookups read the real "lpstat -v" listing.
TEST_F(CupsQueues, LookupsMatchNamesAndAddressesInTheRealQueueList) {
    Lpadmin("office", "socket://10.0.0.11/");
    Lpadmin("office12", "lpd://10.0.0.12/raw");
    Lpadmin("usbprinter1", std::string("usb:/dev/usb/") + kA);
    // The lookups by address only read CUPS when the appliance has printers.
    PlaceFile(kNptab, "10.0.0.11=\"office\"\n");
    struct { const char *szIp; int32_t iExpected; } const ipCases[] = {
        {"10.0.0.11", 0}, {"10.0.0.12", 0}, {"10.0.0.1", 1}, {"", 0}};
    for (const auto &c : ipCases) EXPECT_EQ(XAVOPrinterNetIPCheck(c.szIp), c.iExpected) << c.szIp;
    struct { const char *szIp, *szName; int32_t iExpected; } const nameCases[] = {
        {"10.0.0.11", "office", 1}, {"10.0.0.12", "office", 2}, {"10.0.0.12", "office12", 1},
        {"10.0.0.1", "office", 2},  {"10.0.0.11", "office1", 0}, {"10.0.0.11", "OFFICE", 0}};
    for (const auto &c : nameCases) EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck(c.szIp, c.szName), c.iExpected) << c.szName;
    // The USB name check is a substring match on whole lines.
    struct { const char *szId, *szName; int32_t iExpected; } const usbCases[] = {
        {kA, "usbprinter1", 1}, {kB, "usbprinter1", 2}, {kA, "usbprinter", 1}, {kA, "office", 2}, {kA, "usbprinter2", 0}};
    for (const auto &c : usbCases) EXPECT_EQ(XAVOPrinterCupsNameCheck(c.szId, c.szName), c.iExpected) << c.szName;
    // No printers registered: the address lookups answer "free" unasked.
    unlink(kNptab);
    EXPECT_EQ(XAVOPrinterNetIPCheck("10.0.0.11"), 1);
    EXPECT_EQ(XAVOPrinterNetCupsNameAndIPCheck("10.0.0.11", "office"), 0);
    EXPECT_TRUE(TakeSleeps().empty());
}

TEST_F(CupsQueues, RemovalTakesOnlyTheQueuesThatAreThePrinters) {
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    // kB's stored name is held in CUPS for kA's device: never removed.
    ORLICFileSetSectionValue(kConf, kB, "cups printer name", "usbprinter1");
    Logs();
    EXPECT_EQ(XAVOPrinterCupsRm(kB), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_printer_rm:N cannot find cups printer name, printer=04b8:0005:SN0002"));
    EXPECT_TRUE(Queue("usbprinter1").exists);
    // By name, only the exact "usbprinter1" takes the alias with it.
    EXPECT_EQ(XAVOPrinterCupsRmByName("USBPRINTER1"), 0);
    EXPECT_FALSE(Queue("usbprinter1").exists);
    EXPECT_TRUE(Queue("usbprinter").exists);
    EXPECT_EQ(XAVOPrinterCupsRmByName("nosuchqueue"), 0);  // lpadmin's refusal is not a failure
}

TEST_F(CupsQueues, SchedulerFileLosesExactlyTheUsbBlocksWhileStopped) {
    ASSERT_EQ(XAVOPrinterCupsAdd(kA, nullptr), 0);
    ASSERT_EQ(XAVOPrinterCupsAdd(kB, nullptr), 0);
    Lpadmin("usbprinter12", "socket://10.0.0.12/");
    Logs();
    EXPECT_EQ(XAVOPrinterCupsUsbConfRmAll(), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_SERVICE_RUNNING);
    EXPECT_THAT(Logs(), ElementsAre(StartsWith("3 printer_cups_usb_conf_rm_all:N skip remove printer, cupsd alive. "
                                               "[0xD000 printer_cups_usb_conf_rm_all:")));

    Cupsd::Stop();
    struct stat old;
    ASSERT_EQ(stat(kCupsConf, &old), 0);
    ASSERT_EQ(XAVOPrinterCupsUsbConfRmAll(), 0);
    // Replaced by a new file, not rewritten in place, with the temporary
    // file's own mode.
    struct stat now;
    ASSERT_EQ(stat(kCupsConf, &now), 0);
    EXPECT_NE(now.st_ino, old.st_ino);
    EXPECT_EQ(now.st_mode & 07777, 0600u);
    // The scheduler reads the edited file back, the USB queues gone (the
    // block edges are pinned against crafted files in the fault tests).
    Cupsd::Start();
    EXPECT_EQ(Tool({"/usr/bin/lpstat", "-v"}), "device for usbprinter12: socket://10.0.0.12/\n");
}

