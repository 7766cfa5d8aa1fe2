// Network printers: the table of addresses and CUPS printer names, its
// listing, the printer's section, and the Samba printer share.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/paths.h"
#include "support/records.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kPrinter[] = "10.0.0.5-office";

// Over a stored "QName": lpd and ipp write the record's remote queue when it
// gives one, socket and bjnp always, other backends (in any case) never.
TEST(NetPrinterSection, QNameFollowsTheBackend) {
    struct {
        const char *szBackend, *szQName, *szAfter;
    } cases[] = {{"ipp", "", "old"}, {"lpd", "q", "q"}, {"socket", "q", "q"}, {"bjnp", "", ""}, {"IPP", "q", "old"}};
    for (const auto &c : cases) {
        ResetSandbox();
        WriteSection(kConf, kPrinter, {{"QName", "old"}});
        NetPrinterConf conf = NetRecord("10.0.0.5", "office", c.szBackend, c.szQName);
        ASSERT_EQ(XAVOPrinterNetConfSetup(&conf, 0), 0);
        EXPECT_EQ(ReadSection(kConf, kPrinter)["QName"], c.szAfter) << c.szBackend << "/" << c.szQName;
    }
}

TEST(NetPrinterSection, EmptyFieldsKeepStoredValuesUnlessWriteEmptyClearsTheDriver) {
    const Section stored = {{"IP", "10.0.0.5"}, {"cups printer name", "office"}, {"driver", "d.ppd"},
                            {"driver brand", "B"}, {"Brand", "ACME"}, {"own key", "kept"}};
    for (int blWriteEmpty : {0, 1}) {
        ResetSandbox();
        WriteSection(kConf, kPrinter, stored);
        NetPrinterConf conf = NetRecord("", "");
        std::strcpy(conf.szPrinterId, kPrinter);
        ASSERT_EQ(XAVOPrinterNetConfSetup(&conf, blWriteEmpty), 0);
        Section expected = stored;
        if (blWriteEmpty) expected["driver"] = expected["driver brand"] = "";
        EXPECT_EQ(ReadSection(kConf, kPrinter), expected) << "blWriteEmpty " << blWriteEmpty;
    }
    NetPrinterConf fresh = NetRecord("10.0.0.9", "new", "socket");
    std::memcpy(fresh.szFitToPage, "yesyesye", 8);  // unterminated: read no further than the field
    ASSERT_EQ(XAVOPrinterNetConfSetup(&fresh, 0), 0);
    EXPECT_EQ(ReadSection(kConf, "10.0.0.9-new"), (Section{{"IP", "10.0.0.9"}, {"cups printer name", "new"},
                                                           {"Backend", "socket"}, {"QName", ""},
                                                           {"fit to page", "yesyesye"}}));
    EXPECT_EQ(XAVOPrinterNetConfSetup(nullptr, 0), -1);
}

TEST(NetPrinterTable, AddReplacesByAddressAndRemovalNeedsAddressAndName) {
    NetPrinterConf office = NetRecord("10.0.0.5", "office"), lab = NetRecord("10.0.0.6", "lab");
    NetPrinterConf front = NetRecord("10.0.0.5", "front"), elsewhere = NetRecord("10.0.0.50", "front");
    EXPECT_EQ(XAVOPrinterNetUpdateConf(0, &office), 0);  // no table: nothing to do, no share
    EXPECT_FALSE(FileExists(kSmbConf));
    for (NetPrinterConf *p : {&office, &lab, &front}) ASSERT_EQ(XAVOPrinterNetUpdateConf(1, p), 0);
    EXPECT_EQ(XAVOPrinterNetUpdateConf(0, &office), 0);     // name differs
    EXPECT_EQ(XAVOPrinterNetUpdateConf(0, &elsewhere), 0);  // address differs
    EXPECT_EQ(ReadFile(kNptab), "10.0.0.5=\"front\"\n10.0.0.6=\"lab\"\n");
    EXPECT_EQ(XAVOPrinterNetUpdateConf(0, &front), 0);
    EXPECT_EQ(ReadFile(kNptab), "10.0.0.6=\"lab\"\n");
    // Texts that would break the table's line are refused.
    for (auto [ip, name] : {std::pair{"10.0.0.7", "a\"b"}, std::pair{"10.0.0.7", "a\n1.2.3.4=\"x"},
                            std::pair{"10.0=0.7", "x"}, std::pair{"", "x"}}) {
        NetPrinterConf bad = NetRecord(ip, name);
        EXPECT_EQ(XAVOPrinterNetUpdateConf(1, &bad), -1) << name;
        EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    }
    EXPECT_EQ(ReadFile(kNptab), "10.0.0.6=\"lab\"\n");
    Logs();
    EXPECT_EQ(XAVOPrinterNetUpdateConf(1, nullptr), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_net_update_conf:N Invaild Argument (((void *)0) != pNPConf)=[0]\n"));
}

TEST(NetPrinterListing, ListsIdsUpToTheFirstBadLine) {
    const std::string failed = "3 printer_net_nptab_enum:N Failed to get network printer ID.";
    const std::string ip = "192.168.100.200";  // 15 characters
    auto line = [](const std::string &a, const std::string &n) { return a + "=\"" + n + "\"\n"; };
    struct {
        std::string table;  // "": no file
        int32_t result;
        std::vector<std::string> ids, logs;
        std::uint32_t code;  // 0: not checked
    } cases[] = {
        {"", 0, {"kept"}, {}, ERR_OPEN},
        // Blank lines skipped, the last line read without its line end.
        {"\n" + line("10.0.0.6", "lab") + "\n10.0.0.5=\"office\"", 0, {"kept", "10.0.0.6-lab", kPrinter}, {}, 0},
        {line("10.0.0.5", "office") + "10.0.0.7=lab\n" + line("10.0.0.6", "lab"), -1, {"kept", kPrinter},
         {"3 printer_net_nptab_enum:N Parse printer name failed. 2", failed}, 0},
        {line("10.0.0.5", "office") + " \n", -1, {"kept", kPrinter},
         {"3 printer_net_nptab_enum:N Parse printer name failed. 1", failed}, 0},
        // An ID of 1023 characters fits 1024 bytes; one more does not.
        {line(ip, std::string(1007, 'n')), 0, {"kept", ip + "-" + std::string(1007, 'n')}, {}, 0},
        {line("10.0.0.5", "office") + line(ip, std::string(1008, 'n')), -1, {"kept", kPrinter}, {failed},
         ERR_BUF_TOO_SMALL},
        {line(ip, std::string(100000, 'n')), -1, {"kept"}, {failed}, ERR_BUF_TOO_SMALL},
    };
    for (const auto &c : cases) {
        ResetSandbox();
        if (!c.table.empty()) PlaceFile(kNptab, c.table);
        ORLICSzList *list = ORLICSzListAlloc(256);
        ORLICSzListPush(&list, "kept");  // added to, not replaced
        EXPECT_EQ(XAVOPrinterNetNptabEnum(&list), c.result) << c.table.substr(0, 80);
        EXPECT_EQ(Items(list), c.ids);
        ORLICSzListFree(list);
        EXPECT_EQ(c.code ? ORLICErrGet() : 0u, c.code);
        std::vector<std::string> logs = Logs();
        for (std::string &l : logs) l = l.substr(0, l.find('['));  // without the error tail
        EXPECT_EQ(logs, c.logs);
    }
    EXPECT_EQ(XAVOPrinterNetNptabEnum(nullptr), -1);
}

TEST(SmbPrinterShare, ExistingSectionIsNeverRewrittenAndActiveNeedsEightEntries) {
    NetPrinterConf office = NetRecord();
    EXPECT_EQ(XAVOPrinterIsActive(), 0);  // no file, nothing logged
    ASSERT_EQ(XAVOPrinterNetUpdateConf(1, &office), 0);
    EXPECT_EQ(XAVOPrinterIsActive(), 0);  // the seven keys written are not enough
    ASSERT_EQ(ORLICFileSetSectionValue(kSmbConf, "printers", "printer admin", "admin"), 0);
    EXPECT_EQ(XAVOPrinterIsActive(), 1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_is_active:N Section [Printers] should contain at least 8 entries.[7]"));
    for (const char *szFile : {"[printers]\n", "[global]\n\tworkgroup = X\n[printers]\n\tpath = /elsewhere\n"}) {
        PlaceFile(kSmbConf, szFile);
        ASSERT_EQ(XAVOPrinterNetUpdateConf(1, &office), 0);
        EXPECT_EQ(ReadFile(kSmbConf), szFile);
    }
    EXPECT_EQ(XAVOPrinterIsActive(), 0);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_is_active:N Section [Printers] should contain at least 8 entries.[1]"));
}

TEST(NetPrinterPlatformFailures, AddAndRemoveFailCleanly) {
    const std::string updateFailed = "3 printer_net_update_conf:N /usr/xavo/etc/nptab update entry 10.0.0.5=office failed.";
    NetPrinterConf office = NetRecord();
    // Removal: -1 with the call's code and the update-failed line; an unreadable table has nothing to remove.
    const std::map<std::string, std::uint32_t> codes = {
        {"ORLICSzHashAlloc", ERR_OUT_OF_MEMORY}, {"ORLICSzListAlloc", ERR_OUT_OF_MEMORY},
        {"ORLICFileRemoveKey", ERR_REMOVE_KEY}};
    SweepFailures([] { PlaceFile(kNptab, "10.0.0.6=\"lab\"\n10.0.0.5=\"office\"\n"); },
                  [&] { return XAVOPrinterNetUpdateConf(0, &office); },
                  [&](const std::string &failed, int32_t result) {
                      EXPECT_EQ(result, failed == "ORLICFileGetPair" ? 0 : -1);
                      if (result != 0) {
                          EXPECT_EQ(ORLICErrGet(), codes.count(failed) ? codes.at(failed) : kInjectedCode);
                          EXPECT_THAT(Logs(), Contains(StartsWith(updateFailed)));
                      }
                  });
    // Add: the table's failure, or the share's, which keeps the new line; an unreadable share is written anew.
    SweepFailures([] {}, [&] { return XAVOPrinterNetUpdateConf(1, &office); },
                  [&](const std::string &failed, int32_t result) {
                      EXPECT_EQ(result, failed == "ORLICFileGetSection" ? 0 : -1);
                      if (failed == "ORLICFileSetKeyValue") {
                          EXPECT_EQ(ORLICErrGet(), kInjectedCode);
                          EXPECT_THAT(Logs(), Contains(StartsWith(updateFailed)));
                      } else if (result != 0) {
                          EXPECT_EQ(ReadFile(kNptab), "10.0.0.5=\"office\"\n");
                          EXPECT_THAT(Logs(), Contains(StartsWith("3 printer_net_update_conf:N update smb.conf failed, "
                                                                  "printer=10.0.0.5[0x")));
                      }
                  });
}

}  // namespace
