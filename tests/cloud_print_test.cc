// The cloud print account: which secret is in force, what reaches the file
// and the log, and that every platform failure is a clean failure.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "support/cases.h"
#include "support/fault_sweep.h"
#include "support/logs.h"
#include "support/sections.h"
#include "xavoprinter.h"

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using xavo::test::Logs;

namespace {

constexpr char kConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kSection[] = "Google Cloud Print";

using xavo::test::Section;

Section ReadSection() { return xavo::test::ReadSection(kConf, kSection); }

void WriteSection(const Section &keys) {
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    for (const auto &[k, v] : keys) ORLICSzHashSetValue(&hash, k.c_str(), v.c_str());
    if (ORLICFileAddSection(kConf, kSection, hash, "\t%s = %s\n") == 0) {
        ORLICFileSetSection(kConf, kSection, kSection, hash, "\t%s = %s\n");
    }
    ORLICSzHashFree(hash);
}

PrinterGoogleInfo Info(const char *szAccount, const char *szPassword, const char *szToken) {
    PrinterGoogleInfo info;
    std::memset(&info, 0, sizeof info);
    std::strncpy(info.szAccount, szAccount, sizeof info.szAccount - 1);
    std::strncpy(info.szPassword, szPassword, sizeof info.szPassword - 1);
    std::strncpy(info.szRefreshToken, szToken, sizeof info.szRefreshToken - 1);
    return info;
}

PrinterGoogleInfo Junk() {
    PrinterGoogleInfo info;
    std::memset(&info, 'j', sizeof info);
    return info;
}

// Everything the get filled, as one comparable value.
std::string Show(const PrinterGoogleInfo &info) {
    return std::string(info.szAccount) + "|" + info.szPassword + "|" + info.szRefreshToken;
}

constexpr char kPassword[] = "pa55-Word_of_the_owner";
constexpr char kToken[] = "1//0refresh-token-of-the-account";

// Records set one after another, and what is then stored and read back:
// the secret in force is the one last given, a password winning over a
// token in the same record; each is stored enciphered.
struct StateCase {
    const char *szName;
    std::vector<PrinterGoogleInfo> sets;
    bool bPassStored, bTokenStored;
    bool bTokenKept;  // the token stored by the first set is still there
    std::string shown;
};

TEST(CloudPrintState, SecretInForceIsTheLastGivenAndComesBackDeciphered) {
    const std::string account = "owner@example.com";
    const PrinterGoogleInfo pass = Info(account.c_str(), kPassword, ""), token = Info(account.c_str(), "", kToken);
    const StateCase cases[] = {
        {"password", {pass}, true, false, false, account + "|" + kPassword + "|"},
        {"token over a password deletes it", {pass, token}, false, true, false, account + "||" + kToken},
        {"password over a token keeps it", {token, Info(account.c_str(), kPassword, "another-token")}, true, true,
         true, account + "|" + kPassword + "|"},
    };
    for (const StateCase &c : cases) {
        SCOPED_TRACE(c.szName);
        xavo::test::ResetSandbox();
        Section first;
        for (PrinterGoogleInfo in : c.sets) {
            ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
            if (first.empty()) first = ReadSection();
        }
        Section s = ReadSection();
        EXPECT_EQ(s.size(), 1u + c.bPassStored + c.bTokenStored);
        EXPECT_EQ(s["google account"], account);
        EXPECT_EQ(s.count("google pass"), c.bPassStored ? 1u : 0u);
        EXPECT_THAT(xavo::test::ReadFile(kConf), AllOf(Not(HasSubstr(kPassword)), Not(HasSubstr(kToken))));
        EXPECT_EQ(s.count("refresh token"), c.bTokenStored ? 1u : 0u);
        if (c.bTokenKept) {
            EXPECT_EQ(s["refresh token"], first["refresh token"]);
        }
        PrinterGoogleInfo out = Junk();
        EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), 0);
        EXPECT_EQ(Show(out), c.shown);
        EXPECT_THAT(Logs(), IsEmpty());
    }
}

TEST(CloudPrintState, KeysOfOtherServicesSurviveASet) {
    WriteSection({{"google account", "old@example.com"}, {"printer proxy id", "prx-42"}, {"enabled", "yes"}});
    PrinterGoogleInfo in = Info("new@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
    Section s = ReadSection();
    EXPECT_EQ(s["google account"], "new@example.com");
    EXPECT_EQ(s["printer proxy id"], "prx-42");
    EXPECT_EQ(s["enabled"], "yes");
    EXPECT_EQ(s.size(), 4u);
}

TEST(CloudPrintState, UnterminatedFieldsAreReadToTheirWidthAndCutOnTheWayBack) {
    PrinterGoogleInfo out = Junk();
    PrinterGoogleInfo full;
    std::memset(&full, 'p', sizeof full);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&full), 0);
    EXPECT_EQ(ReadSection()["google account"], std::string(255, 'p'));
    ASSERT_EQ(XAVOPrinterGoogleInfoGet(&out), 0);
    EXPECT_EQ(Show(out), std::string(254, 'p') + "|" + std::string(127, 'p') + "|");
}

// ---- reading -------------------------------------------------------------

// A password that is no cipher text at all is a row of the table below.
TEST(CloudPrintGet, DamagedCipherTextFailsWithTheAccountKept) {
    PrinterGoogleInfo in = Info("owner@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
    Section s = ReadSection();
    std::string &cipher = s["refresh token"];
    cipher[cipher.size() / 2] = cipher[cipher.size() / 2] == 'A' ? 'B' : 'A';
    WriteSection(s);
    PrinterGoogleInfo out = Junk();
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), -1);
    EXPECT_EQ(Show(out), "owner@example.com||");
    EXPECT_THAT(Logs(), ElementsAre("3 printer_google_info_get:N decrypt failed"));
}

struct GetCase {
    const char *szName;
    Section stored;  // empty: no section at all
    const char *szLog;  // nullptr: nothing logged
    const char *szShown;
};

const GetCase kGetFailures[] = {
    {"no section", {}, nullptr, "||"},
    {"no account", {{"google pass", "x"}, {"refresh token", "y"}}, nullptr, "||"},
    {"account without secret", {{"google account", "a@b"}},
     "3 printer_google_info_get:N Can't get password and refresh_token", "a@b||"},
    {"empty secrets count as none", {{"google account", "a@b"}, {"google pass", ""}, {"refresh token", ""}},
     "3 printer_google_info_get:N Can't get password and refresh_token", "a@b||"},
    {"secret stored in clear", {{"google account", "a@b"}, {"google pass", "plain"}},
     "3 printer_google_info_get:N decrypt failed", "a@b||"},
};

class CloudPrintGetFailure : public ::testing::TestWithParam<GetCase> {};

TEST_P(CloudPrintGetFailure, FailsWithTheRecordCleared) {
    const GetCase &c = GetParam();
    if (!c.stored.empty()) WriteSection(c.stored);
    PrinterGoogleInfo out = Junk();
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), -1);
    EXPECT_EQ(Show(out), c.szShown);
    EXPECT_EQ(out.szAccount[sizeof out.szAccount - 1], '\0');
    if (c.szLog) {
        EXPECT_THAT(Logs(), ElementsAre(c.szLog));
    } else {
        EXPECT_THAT(Logs(), IsEmpty());
    }
}

INSTANTIATE_TEST_SUITE_P(Stores, CloudPrintGetFailure, ::testing::ValuesIn(kGetFailures), xavo::test::CaseName());

// ---- writing -------------------------------------------------------------

TEST(CloudPrintArguments, NullRecordFailsSilentlyWithBadParameters) {
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    ORLICErrSetEx(0, "test", 0);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), IsEmpty());
}

// A busy printer lock is pinned through the configuration store, whose
// lock guard the set shares.
TEST(CloudPrintSet, EmptyAccountLeavesTheFileUntouched) {
    WriteSection({{"google account", "kept@example.com"}, {"google pass", "cipher"}});
    const std::string before = xavo::test::ReadFile(kConf);
    PrinterGoogleInfo in = Info("", kPassword, kToken);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(&in), -1);
    EXPECT_EQ(xavo::test::ReadFile(kConf), before);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_google_info_set:N google account can't be empty"));
}

// Every platform call of a set or a get failed in turn: the operation
// fails (or rides the failure out, a repeated lock try or an old section
// read as empty, and stores the new account), the stored account is the
// old one or the new one, no clear secret is written, and the printer
// lock is free again.
TEST(CloudPrintFaults, EveryPlatformFailureIsACleanFailure) {
    const std::string oldFile = [] {
        PrinterGoogleInfo old = Info("old@example.com", "old-pass", "");
        EXPECT_EQ(XAVOPrinterGoogleInfoSet(&old), 0);
        return xavo::test::ReadFile(kConf);
    }();
    PrinterGoogleInfo in = Info("new@example.com", "", kToken);
    xavo::test::SweepFailures([&] { xavo::test::PlaceFile(kConf, oldFile); },
                              [&] { return XAVOPrinterGoogleInfoSet(&in); },
                              [&](const std::string &, int32_t result) {
                                  const std::string file = xavo::test::ReadFile(kConf);
                                  if (result == 0) {
                                      EXPECT_THAT(file, HasSubstr("new@example.com"));
                                  } else {
                                      EXPECT_LT(result, 0);
                                      EXPECT_EQ(file, oldFile);
                                  }
                                  EXPECT_THAT(file, Not(HasSubstr(kToken)));
                                  for (const xavo::test::LogLine &l : xavo::test::TakeLogs()) {
                                      EXPECT_THAT(l.message, Not(HasSubstr(kToken))) << "a clear secret logged";
                                  }
                                  int fd = XAVOPrinterPrinterConfLock();
                                  EXPECT_GE(fd, 0) << "the printer lock was left held";
                                  XAVOPrinterPrinterConfUnlock(fd);
                              });
    xavo::test::SweepFailures([&] { ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0); },
                              [] {
                                  PrinterGoogleInfo out = Junk();
                                  int32_t result = XAVOPrinterGoogleInfoGet(&out);
                                  if (result != 0) {  // no secret handed out by a failed read
                                      EXPECT_EQ(out.szPassword[0], '\0');
                                      EXPECT_EQ(out.szRefreshToken[0], '\0');
                                  }
                                  return result;
                              },
                              [](const std::string &failed, int32_t result) {
                                  EXPECT_EQ(result, -1);
                                  if (failed == "ORLICSzHashAlloc") {
                                      EXPECT_EQ(ORLICErrGet(), ERR_OUT_OF_MEMORY);
                                  }
                                  for (const xavo::test::LogLine &l : xavo::test::TakeLogs()) {
                                      EXPECT_THAT(l.message, Not(HasSubstr(kToken))) << "a clear secret logged";
                                  }
                              });
}

}  // namespace
