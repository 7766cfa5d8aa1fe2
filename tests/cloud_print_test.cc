// The cloud print account: which secret is in force, what reaches the file
// and the log, and that every platform failure is a clean failure.
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

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using xavo::test::CloudRecord;
using xavo::test::kConf;
using xavo::test::Logs;

namespace {

constexpr char kSection[] = "Google Cloud Print";
constexpr char kPassword[] = "pa55-Word_of_the_owner";
constexpr char kToken[] = "1//0refresh-token-of-the-account";

using xavo::test::Section;

Section ReadSection() { return xavo::test::ReadSection(kConf, kSection); }

// The file holding just the cloud print section.
void WriteSection(const Section &keys) {
    xavo::test::PlaceFile(kConf, "");
    xavo::test::WriteSection(kConf, kSection, keys);
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

void ExpectNoClearSecretLogged() {
    for (const xavo::test::LogLine &l : xavo::test::TakeLogs()) EXPECT_THAT(l.message, Not(HasSubstr(kToken)));
}

// Records set one after another, and what is then stored and read back:
// the secret in force is the one last given, a password winning over a
// token in the same record; keys of other services stay.  Fields that
// fill their whole width are read to it and cut on the way back.
struct StateCase {
    const char *szName;
    std::vector<PrinterGoogleInfo> sets;
    std::string account;  // as stored
    bool bPassStored, bTokenStored;
    bool bTokenKept;  // the token stored by the first set is still there
    std::string shown;
};

TEST(CloudPrintState, SecretInForceIsTheLastGivenAndComesBackDeciphered) {
    const std::string account = "owner@example.com";
    const PrinterGoogleInfo pass = CloudRecord(account.c_str(), kPassword, "");
    const PrinterGoogleInfo token = CloudRecord(account.c_str(), "", kToken);
    PrinterGoogleInfo full;
    std::memset(&full, 'p', sizeof full);
    const StateCase cases[] = {
        {"password", {pass}, account, true, false, false, account + "|" + kPassword + "|"},
        {"token over a password deletes it", {pass, token}, account, false, true, false, account + "||" + kToken},
        {"password over a token keeps it", {token, CloudRecord(account.c_str(), kPassword, "another-token")}, account,
         true, true, true, account + "|" + kPassword + "|"},
        {"unterminated fields", {full}, std::string(255, 'p'), true, false, false,
         std::string(254, 'p') + "|" + std::string(127, 'p') + "|"},
    };
    for (const StateCase &c : cases) {
        SCOPED_TRACE(c.szName);
        WriteSection({{"google account", "old@example.com"}, {"printer proxy id", "prx-42"}});
        Section first;
        for (PrinterGoogleInfo in : c.sets) {
            ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
            if (first.empty()) first = ReadSection();
        }
        Section s = ReadSection();
        EXPECT_EQ(s["google account"], c.account);
        EXPECT_EQ(s["printer proxy id"], "prx-42");
        EXPECT_EQ(s.count("google pass"), c.bPassStored ? 1u : 0u);
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

TEST(CloudPrintGet, FailuresLeaveTheRecordClearedButForTheAccount) {
    const std::string noSecret = "3 printer_google_info_get:N Can't get password and refresh_token";
    const std::string decryptFailed = "3 printer_google_info_get:N decrypt failed";
    struct {
        Section stored;  // empty: no section at all
        std::string log, shown;
    } cases[] = {
        {{}, "", "||"},
        {{{"google pass", "x"}, {"refresh token", "y"}}, "", "||"},  // no account
        {{{"google account", "a@b"}}, noSecret, "a@b||"},
        {{{"google account", "a@b"}, {"google pass", ""}, {"refresh token", ""}}, noSecret, "a@b||"},
        {{{"google account", "a@b"}, {"google pass", "plain"}}, decryptFailed, "a@b||"},  // no cipher text at all
    };
    for (const auto &c : cases) {
        xavo::test::ResetSandbox();
        if (!c.stored.empty()) WriteSection(c.stored);
        PrinterGoogleInfo out = Junk();
        EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), -1);
        EXPECT_EQ(Show(out), c.shown);
        EXPECT_EQ(Logs(), std::vector<std::string>(c.log.empty() ? 0 : 1, c.log)) << c.shown;
    }
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST(CloudPrintSet, EmptyAccountOrNoRecordLeavesTheFileUntouched) {
    WriteSection({{"google account", "kept@example.com"}, {"google pass", "cipher"}});
    const std::string before = xavo::test::ReadFile(kConf);
    PrinterGoogleInfo in = CloudRecord("", kPassword, kToken);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(&in), -1);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_EQ(xavo::test::ReadFile(kConf), before);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_google_info_set:N google account can't be empty"));
}

// Every platform call of a set or a get failed in turn: a set fails (or
// rides out a repeated lock try or an unreadable old section and stores the
// new account), leaving the old file and the printer lock free; a get hands
// out no secret; neither writes or logs a clear one.
TEST(CloudPrintFaults, EveryPlatformFailureIsACleanFailure) {
    PrinterGoogleInfo old = CloudRecord("old@example.com", "old-pass", "");
    PrinterGoogleInfo in = CloudRecord("new@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&old), 0);
    const std::string oldFile = xavo::test::ReadFile(kConf);
    auto checkSet = [&](const std::string &, int32_t result) {
        const std::string file = xavo::test::ReadFile(kConf);
        if (result == 0) {
            EXPECT_THAT(file, HasSubstr("new@example.com"));
        } else {
            EXPECT_EQ(file, oldFile);
        }
        EXPECT_THAT(file, Not(HasSubstr(kToken)));
        ExpectNoClearSecretLogged();
        int fd = XAVOPrinterPrinterConfLock();
        EXPECT_GE(fd, 0) << "the printer lock was left held";
        XAVOPrinterPrinterConfUnlock(fd);
    };
    xavo::test::SweepFailures([&] { xavo::test::PlaceFile(kConf, oldFile); },
                              [&] { return XAVOPrinterGoogleInfoSet(&in); }, checkSet);
    auto get = [] {
        PrinterGoogleInfo out = Junk();
        int32_t result = XAVOPrinterGoogleInfoGet(&out);
        if (result != 0) {
            EXPECT_EQ(std::string(out.szPassword) + out.szRefreshToken, "") << "a secret from a failed read";
        }
        return result;
    };
    xavo::test::SweepFailures([&] { ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0); }, get,
                              [](const std::string &failed, int32_t result) {
                                  EXPECT_EQ(result, -1);
                                  if (failed == "ORLICSzHashAlloc") {
                                      EXPECT_EQ(ORLICErrGet(), ERR_OUT_OF_MEMORY);
                                  }
                                  ExpectNoClearSecretLogged();
                              });
}

}  // namespace
