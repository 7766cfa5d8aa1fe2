// The printer configuration store: the printer lock, the merge of a USB
// printer's section, and the CUPS printer name lookup.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstring>
#include <map>
#include <string>

#include "support/logs.h"
#include "support/paths.h"
#include "support/records.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace xavo::test;

namespace {

constexpr char kPrinter[] = "04b8:0005:SN0001";

// A stored section in which every key the record can carry has a value,
// plus keys the record does not carry.
const Section kStored = {
    {"producer", "Old Maker"},       {"product name", "Old Model"},   {"mode", "lpr"},
    {"autolock timer", "10"},        {"manuallock timer", "20"},      {"enable airprint", "yes"},
    {"enable google cloud print", "no"}, {"driver", "old.ppd"},       {"driver brand", "OldBrand"},
    {"usblp string id", "MFG:Old;"}, {"fit to page", "yes"},          {"cups printer name", "usbprinter1"},
    {"custom key", "kept"},
};

// Filled fields replace stored values, other keys stay; an empty field
// leaves its stored value, unless blWriteEmpty asks to clear and the key is
// one of the four clearable ones, which a new section then holds empty.
TEST(PrinterConfSetup, FilledFieldsReplaceAndEmptyOnesClearOnlyTheClearableKeysWhenAsked) {
    const Section filled = {{"product name", "Model 100"}, {"mode", "usbip"}, {"driver", "new.ppd"},
                            {"fit to page", "no"}};
    const Section cleared = {{"autolock timer", ""}, {"manuallock timer", ""}, {"driver", ""}, {"driver brand", ""}};
    for (const Section &stored : {kStored, Section{}}) {
        for (int blWriteEmpty : {0, 1}) {
            ResetSandbox();
            if (!stored.empty()) WriteSection(kConf, kPrinter, stored);
            UsbPrinterConf conf = UsbRecord(kPrinter);
            std::strcpy(conf.szProductName, "Model 100");
            std::strcpy(conf.szMode, "usbip");
            std::strcpy(conf.szDriver, "new.ppd");
            std::strcpy(conf.szFitToPage, "no");
            ASSERT_EQ(XAVOPrinterConfSetup(&conf, blWriteEmpty), 0);
            Section expected = stored;
            for (const auto &[key, value] : blWriteEmpty ? cleared : Section{}) expected[key] = value;
            for (const auto &[key, value] : filled) expected[key] = value;
            EXPECT_EQ(ReadSection(kConf, kPrinter), expected)
                << stored.size() << " keys, blWriteEmpty " << blWriteEmpty;
        }
    }
    EXPECT_THAT(ReadFile(kConf), ::testing::HasSubstr("\tdriver = new.ppd\n"));
    EXPECT_THAT(Logs(), IsEmpty());
    EXPECT_EQ(XAVOPrinterConfSetup(nullptr, 0), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
}

// flock() refuses every other open of the lock file, so a lock this process
// holds stands for another process's.
TEST(PrinterConfLock, BusyLockIsTriedAHundredTimesAndTakenAtOnceWhenReleased) {
    WriteSection(kConf, kPrinter, kStored);
    const std::string before = ReadFile(kConf);
    const int fdHeld = XAVOPrinterPrinterConfLock();
    ASSERT_GE(fdHeld, 0);
    TakeSleeps();
    EXPECT_EQ(XAVOPrinterPrinterConfLock(), -1);
    EXPECT_EQ(TakeSleeps(), std::vector<std::uint64_t>(100, 50000));
    UsbPrinterConf conf = UsbRecord(kPrinter);
    std::strcpy(conf.szProducer, "New");
    EXPECT_EQ(XAVOPrinterConfSetup(&conf, 1), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_LOCK);
    EXPECT_EQ(ReadFile(kConf), before);
    TakeSleeps();
    Logs();
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(fdHeld), 1);
    const int fd = XAVOPrinterPrinterConfLock();
    ASSERT_GE(fd, 0);
    EXPECT_TRUE(TakeSleeps().empty());
    close(fd);
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(fd), 0);  // closed
    EXPECT_EQ(XAVOPrinterPrinterConfUnlock(-1), 0);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_conf_unlock:N Invaild Argument (0 <= fdLock)=[0]\n"));
}

// A missing section and an empty name are pinned through the print
// submission's refusals; a section without the name is logged, bad
// arguments are not.
TEST(PrinterCupsNameGet, FindsTheStoredNameOrFails) {
    WriteSection(kConf, kPrinter, kStored);
    WriteSection(kConf, "no-name", {{"producer", "ACME"}});
    char szName[32] = "junk";
    EXPECT_EQ(XAVOPrinterCupsNameGet(kPrinter, szName, sizeof szName), 0);
    EXPECT_STREQ(szName, "usbprinter1");
    EXPECT_EQ(XAVOPrinterCupsNameGet("no-name", szName, sizeof szName), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_cups_name_get:N get cups printer name failed, printer=no-name"));
    struct {
        const char *id;
        char *buf;
        int32_t cb;
    } bad[] = {{kPrinter, szName, 0}, {kPrinter, nullptr, 32}, {nullptr, szName, 32}};
    for (const auto &c : bad) {
        ORLICErrSetEx(0, "test", 0);
        EXPECT_EQ(XAVOPrinterCupsNameGet(c.id, c.buf, c.cb), -1) << c.cb;
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    }
    EXPECT_THAT(Logs(), IsEmpty());
}

}  // namespace
