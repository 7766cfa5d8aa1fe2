// Network printers: the table of addresses and CUPS printer names, its
// listing, the printer's section, and the Samba printer share.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/records.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using namespace xavo::test;

namespace {

constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kNptab[] = "/usr/xavo/etc/nptab";
constexpr char kSmbConf[] = "/etc/samba/smb.reserved.conf";
constexpr char kPrinter[] = "10.0.0.5-office";

std::vector<std::string> Items(ORLICSzList *list) {
    std::vector<std::string> out;
    for (int i = 0; i < ORLIC_SZLIST_COUNT(list); ++i) out.push_back(ORLICSzListGet(list, i));
    return out;
}

TEST(NetPrinterSection, QNameFollowsTheBackend) {
    struct {
        const char *szBackend, *szQName;
        const char *szOverStored;  // "QName" afterwards over a stored "old"
        const char *szNew;         // in a new section; nullptr: no such key
    } cases[] = {
        {"ipp", "", "old", nullptr}, {"lpd", "q", "q", "q"},   {"socket", "", "", ""},        {"bjnp", "q", "q", "q"},
        {"IPP", "q", "old", nullptr}, {"lpr", "q", "old", nullptr}, {"", "q", "old", nullptr},
    };
    for (const auto &c : cases) {
        for (bool bStored : {true, false}) {
            ResetSandbox();
            NetPrinterConf stored = NetRecord("10.0.0.5", "office", "ipp", "old");
            if (bStored) {
                ASSERT_EQ(XAVOPrinterNetConfSetup(&stored, 0), 0);
            }
            NetPrinterConf conf = NetRecord("10.0.0.5", "office", c.szBackend, c.szQName);
            ASSERT_EQ(XAVOPrinterNetConfSetup(&conf, 0), 0);
            const Section s = ReadSection(kConf, kPrinter);
            const char *szExpected = bStored ? c.szOverStored : c.szNew;
            SCOPED_TRACE(std::string(c.szBackend) + "/" + c.szQName + (bStored ? " over stored" : " new"));
            EXPECT_EQ(s.count("QName"), szExpected ? 1u : 0u);
            if (szExpected && s.count("QName")) {
                EXPECT_EQ(s.at("QName"), szExpected);
            }
        }
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
    EXPECT_THAT(Logs(), ElementsAre("3 printer_net_conf_setup:N Invaild Argument (((void *)0) != pNPConf)=[0]\n"));
}

TEST(NetPrinterTable, AddReplacesByAddressAndRemovalNeedsAddressAndName) {
    NetPrinterConf office = NetRecord("10.0.0.5", "office"), lab = NetRecord("10.0.0.6", "lab");
    NetPrinterConf front = NetRecord("10.0.0.5", "front"), elsewhere = NetRecord("10.0.0.50", "front");
    EXPECT_EQ(XAVOPrinterNetUpdateConf(0, &office), 0);  // no table: nothing to do, no share
    EXPECT_FALSE(FileExists(kSmbConf));
    for (NetPrinterConf *p : {&office, &lab, &front}) ASSERT_EQ(XAVOPrinterNetUpdateConf(1, p), 0);
    EXPECT_EQ(ReadFile(kNptab), "10.0.0.5=\"front\"\n10.0.0.6=\"lab\"\n");
    EXPECT_EQ(ReadSection(kSmbConf, "printers").size(), 7u);
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
        {"", 0, {}, {}, ERR_OPEN},
        {"\n" + line("10.0.0.6", "lab") + "\n" + line("10.0.0.5", "office"), 0, {"10.0.0.6-lab", kPrinter}, {}, 0},
        {"10.0.0.5=\"office\"", 0, {kPrinter}, {}, 0},
        {line("10.0.0.5", "office") + "10.0.0.7=lab\n" + line("10.0.0.6", "lab"), -1, {kPrinter},
         {"3 printer_net_nptab_enum:N Parse printer name failed. 2", failed}, 0},
        {line("10.0.0.5", "office") + " \n", -1, {kPrinter},
         {"3 printer_net_nptab_enum:N Parse printer name failed. 1", failed}, 0},
        // An ID of 1023 characters fits 1024 bytes; one more does not.
        {line(ip, std::string(1007, 'n')), 0, {ip + "-" + std::string(1007, 'n')}, {}, 0},
        {line("10.0.0.5", "office") + line(ip, std::string(1008, 'n')), -1, {kPrinter}, {failed}, ERR_BUF_TOO_SMALL},
        {line(ip, std::string(100000, 'n')), -1, {}, {failed}, ERR_BUF_TOO_SMALL},
    };
    for (const auto &c : cases) {
        ResetSandbox();
        if (!c.table.empty()) PlaceFile(kNptab, c.table);
        ORLICSzList *list = ORLICSzListAlloc(256);
        ORLICSzListPush(&list, "kept");
        EXPECT_EQ(XAVOPrinterNetNptabEnum(&list), c.result) << c.table.substr(0, 80);
        std::vector<std::string> expected = {"kept"};
        expected.insert(expected.end(), c.ids.begin(), c.ids.end());
        EXPECT_EQ(Items(list), expected);
        ORLICSzListFree(list);
        if (c.code) {
            EXPECT_EQ(ORLICErrGet(), c.code);
        }
        std::vector<std::string> logs = Logs();
        for (std::string &l : logs) l = l.substr(0, l.find('['));  // without the error tail
        EXPECT_EQ(logs, c.logs);
    }
    EXPECT_EQ(XAVOPrinterNetNptabEnum(nullptr), -1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_net_nptab_enum:N Invaild Argument (((void *)0) != ppList)=[0]\n"));
}

// A writer adding printers while readers list them: every ID listed is one
// that was added, never a torn line.  (Writers take no lock among
// themselves.)
TEST(NetPrinterListing, ListingsDuringAddsSeeWholeLinesOnly) {
    SetRealSleep(true);
    constexpr int kAdds = 40;
    std::vector<pid_t> children;
    for (int p = 0; p < 4; ++p) {
        pid_t pid = fork();
        ASSERT_GE(pid, 0);
        if (pid == 0) {
            int bad = 0;
            for (int i = 0; i < kAdds; ++i) {
                if (p == 0) {
                    std::string ip = "10.0.0." + std::to_string(i);
                    NetPrinterConf conf = NetRecord(ip.c_str(), ("queue-" + std::to_string(i)).c_str());
                    bad |= XAVOPrinterNetUpdateConf(1, &conf) != 0;
                    continue;
                }
                ORLICSzList *list = ORLICSzListAlloc(256);
                bad |= XAVOPrinterNetNptabEnum(&list) != 0;
                for (const std::string &id : Items(list)) {
                    int a = -1, b = -2;
                    char tail = 0;
                    bad |= std::sscanf(id.c_str(), "10.0.0.%d-queue-%d%c", &a, &b, &tail) != 2 || a != b;
                }
                ORLICSzListFree(list);
            }
            _exit(bad);
        }
        children.push_back(pid);
    }
    for (pid_t pid : children) {
        int status = 0;
        ASSERT_EQ(waitpid(pid, &status, 0), pid);
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    }
    EXPECT_EQ(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_NET, nullptr), kAdds);
}

TEST(SmbPrinterShare, ExistingSectionIsNeverRewrittenAndActiveNeedsEightEntries) {
    NetPrinterConf office = NetRecord();
    EXPECT_EQ(XAVOPrinterIsActive(), 0);  // no file, nothing logged
    PlaceFile(kSmbConf, "[printers]\n");  // empty: set up already, stays empty
    ASSERT_EQ(XAVOPrinterNetUpdateConf(1, &office), 0);
    EXPECT_EQ(ReadFile(kSmbConf), "[printers]\n");
    PlaceFile(kSmbConf, "[global]\n\tworkgroup = X\n[printers]\n\tpath = /elsewhere\n");
    ASSERT_EQ(XAVOPrinterNetUpdateConf(1, &office), 0);
    EXPECT_EQ(ReadSection(kSmbConf, "printers"), (Section{{"path", "/elsewhere"}}));
    EXPECT_EQ(XAVOPrinterIsActive(), 0);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_is_active:N Section [Printers] should contain at least 8 entries.[1]"));
    ResetSandbox();
    ASSERT_EQ(XAVOPrinterNetUpdateConf(1, &office), 0);
    EXPECT_EQ(XAVOPrinterIsActive(), 0);  // the seven keys written are not enough
    ASSERT_EQ(ORLICFileSetSectionValue(kSmbConf, "printers", "printer admin", "admin"), 0);
    EXPECT_EQ(XAVOPrinterIsActive(), 1);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_is_active:N Section [Printers] should contain at least 8 entries.[7]"));
}

TEST(NetPrinterPlatformFailures, AddAndRemoveFailCleanly) {
    const std::string updateFailed = "3 printer_net_update_conf:N /usr/xavo/etc/nptab update entry 10.0.0.5=office failed.";
    NetPrinterConf office = NetRecord();
    // Removal: each failure is the call's, with the update-failed line.
    SweepFailures([] { PlaceFile(kNptab, "10.0.0.6=\"lab\"\n10.0.0.5=\"office\"\n"); },
                  [&] { return XAVOPrinterNetUpdateConf(0, &office); },
                  [&](const std::string &failed, int32_t result) {
                      const std::map<std::string, std::uint32_t> codes = {{"ORLICSzHashAlloc", ERR_OUT_OF_MEMORY},
                                                                          {"ORLICSzListAlloc", ERR_OUT_OF_MEMORY},
                                                                          {"ORLICSzHashEnumKey", kInjectedCode},
                                                                          {"ORLICFileRemoveKey", ERR_REMOVE_KEY}};
                      if (failed == "ORLICFileGetPair") {
                          EXPECT_EQ(result, 0);  // an unreadable table: nothing to remove
                          return;
                      }
                      ASSERT_TRUE(codes.count(failed)) << "unexpected failing call";
                      EXPECT_EQ(result, -1);
                      EXPECT_EQ(ORLICErrGet(), codes.at(failed));
                      EXPECT_THAT(Logs(), Contains(StartsWith(updateFailed)));
                  });
    // Add: the table's failure, or the share's, which keeps the new line.
    SweepFailures([] {}, [&] { return XAVOPrinterNetUpdateConf(1, &office); },
                  [&](const std::string &failed, int32_t result) {
                      std::vector<std::string> logs = Logs();
                      if (failed == "ORLICFileSetKeyValue") {
                          EXPECT_EQ(result, -1);
                          EXPECT_EQ(ORLICErrGet(), kInjectedCode);
                          EXPECT_THAT(logs, Contains(StartsWith(updateFailed)));
                      } else if (failed == "ORLICFileGetSection") {
                          EXPECT_EQ(result, 0);  // an unreadable share is written anew
                      } else {
                          EXPECT_EQ(result, -1);
                          EXPECT_EQ(ReadFile(kNptab), "10.0.0.5=\"office\"\n");
                          EXPECT_THAT(logs, Contains(StartsWith("3 printer_net_update_conf:N update smb.conf failed, "
                                                                "printer=10.0.0.5[0x")));
                      }
                  });
}

}  // namespace
