// The cloud print account: which secret is in force, what reaches the file
// and the log, and that every platform failure is a clean failure.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <string>

#include "appliance/standin_control.h"
#include "support/logs.h"
#include "support/sections.h"
#include "xavoprinter.h"

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

TEST(CloudPrintState, PasswordIsStoredEncipheredAndComesBack) {
    PrinterGoogleInfo in = Info("owner@example.com", kPassword, "");
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
    Section s = ReadSection();
    EXPECT_EQ(s.size(), 2u);
    EXPECT_EQ(s["google account"], "owner@example.com");
    EXPECT_FALSE(s["google pass"].empty());
    EXPECT_NE(s["google pass"], kPassword);

    PrinterGoogleInfo out = Junk();
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), 0);
    EXPECT_EQ(Show(out), std::string("owner@example.com|") + kPassword + "|");
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST(CloudPrintState, TokenStoredOverAPasswordDeletesThePassword) {
    PrinterGoogleInfo pass = Info("owner@example.com", kPassword, "");
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&pass), 0);
    PrinterGoogleInfo token = Info("owner@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&token), 0);
    Section s = ReadSection();
    EXPECT_EQ(s.count("google pass"), 0u);
    EXPECT_FALSE(s["refresh token"].empty());

    PrinterGoogleInfo out = Junk();
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), 0);
    EXPECT_EQ(Show(out), std::string("owner@example.com||") + kToken);
}

TEST(CloudPrintState, PasswordStoredOverATokenKeepsTheTokenButIsInForce) {
    PrinterGoogleInfo token = Info("owner@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&token), 0);
    const std::string storedToken = ReadSection()["refresh token"];
    // Both secrets in the record: only the password is stored.
    PrinterGoogleInfo both = Info("owner@example.com", kPassword, "another-token");
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&both), 0);
    Section s = ReadSection();
    EXPECT_EQ(s["refresh token"], storedToken);
    EXPECT_FALSE(s["google pass"].empty());

    PrinterGoogleInfo out = Junk();
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), 0);
    EXPECT_EQ(Show(out), std::string("owner@example.com|") + kPassword + "|");
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

TEST(CloudPrintState, ClearSecretsNeverReachTheFileOrTheLog) {
    PrinterGoogleInfo pass = Info("owner@example.com", kPassword, "");
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&pass), 0);
    PrinterGoogleInfo token = Info("owner@example.com", "", kToken);
    ASSERT_EQ(XAVOPrinterGoogleInfoSet(&token), 0);
    // A damaged store and a refused write log too: none of it may carry a
    // secret.
    Section s = ReadSection();
    s["refresh token"][3] ^= 0x01;
    WriteSection(s);
    PrinterGoogleInfo out;
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), -1);
    XavoStandinFailCall("ORLICFileAddSection", 1, 0x0B00);
    EXPECT_LT(XAVOPrinterGoogleInfoSet(&pass), 0);
    XavoStandinReset();

    const std::string file = xavo::test::ReadFile(kConf);
    EXPECT_THAT(file, Not(HasSubstr(kPassword)));
    EXPECT_THAT(file, Not(HasSubstr(kToken)));
    for (const xavo::test::LogLine &l : xavo::test::TakeLogs()) {
        EXPECT_THAT(l.message, Not(HasSubstr(kPassword)));
        EXPECT_THAT(l.message, Not(HasSubstr(kToken)));
    }
}

// ---- reading -------------------------------------------------------------

TEST(CloudPrintGet, DamagedCipherTextFailsWithTheAccountKept) {
    for (const char *szKey : {"google pass", "refresh token"}) {
        xavo::test::ResetSandbox();
        PrinterGoogleInfo in = Info("owner@example.com", szKey[0] == 'g' ? kPassword : "", kToken);
        ASSERT_EQ(XAVOPrinterGoogleInfoSet(&in), 0);
        Section s = ReadSection();
        std::string &cipher = s[szKey];
        cipher[cipher.size() / 2] = cipher[cipher.size() / 2] == 'A' ? 'B' : 'A';
        WriteSection(s);
        PrinterGoogleInfo out = Junk();
        EXPECT_EQ(XAVOPrinterGoogleInfoGet(&out), -1) << szKey;
        EXPECT_EQ(Show(out), "owner@example.com||") << szKey;
        EXPECT_THAT(Logs(), ElementsAre("3 printer_google_info_get:N decrypt failed")) << szKey;
    }
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

INSTANTIATE_TEST_SUITE_P(Stores, CloudPrintGetFailure, ::testing::ValuesIn(kGetFailures),
                         [](const auto &p) {
                             std::string s = p.param.szName;
                             for (char &ch : s) if (!isalnum(static_cast<unsigned char>(ch))) ch = '_';
                             return s;
                         });

// ---- writing -------------------------------------------------------------

TEST(CloudPrintSet, EmptyAccountLeavesTheFileUntouched) {
    WriteSection({{"google account", "kept@example.com"}, {"google pass", "cipher"}});
    const std::string before = xavo::test::ReadFile(kConf);
    PrinterGoogleInfo in = Info("", kPassword, kToken);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(&in), -1);
    EXPECT_EQ(xavo::test::ReadFile(kConf), before);
    EXPECT_THAT(Logs(), ElementsAre("3 printer_google_info_set:N google account can't be empty"));
}

TEST(CloudPrintArguments, NullRecordFailsSilentlyWithBadParameters) {
    EXPECT_EQ(XAVOPrinterGoogleInfoGet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    ORLICErrSetEx(0, "test", 0);
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(nullptr), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_BAD_PARAMETERS);
    EXPECT_THAT(Logs(), IsEmpty());
}

TEST(CloudPrintSet, PrinterLockNotTakenFailsWithErrLockAndWritesNothing) {
    WriteSection({{"google account", "kept@example.com"}});
    const std::string before = xavo::test::ReadFile(kConf);
    XavoStandinFailCalls("ORLICFileLockByFile", 1, -1, 0x0E00);
    PrinterGoogleInfo in = Info("owner@example.com", kPassword, "");
    EXPECT_EQ(XAVOPrinterGoogleInfoSet(&in), -1);
    EXPECT_EQ(ORLICErrGet(), ERR_LOCK);
    XavoStandinReset();
    EXPECT_EQ(xavo::test::ReadFile(kConf), before);
    EXPECT_THAT(Logs(), IsEmpty());
}

// Every platform call of a set or a get failed in turn: the operation
// fails, nothing but the call's own line is logged, the stored account is
// either the old one or the new one, and the printer lock is free again.
TEST(CloudPrintFaults, EveryPlatformFailureIsACleanFailure) {
    constexpr uint32_t kInjected = 0x0E00;
    const std::string oldFile = [] {
        PrinterGoogleInfo old = Info("old@example.com", "old-pass", "");
        EXPECT_EQ(XAVOPrinterGoogleInfoSet(&old), 0);
        return xavo::test::ReadFile(kConf);
    }();
    PrinterGoogleInfo in = Info("new@example.com", "", kToken);
    int nFailed = 0;
    for (int n = 1; n < 200; ++n) {
        xavo::test::PlaceFile(kConf, oldFile);
        XavoStandinReset();
        XavoStandinFailCall("*", n, kInjected);
        int32_t r = XAVOPrinterGoogleInfoSet(&in);
        const char *szFailed = XavoStandinLastFailed();
        XavoStandinReset();
        if (szFailed == nullptr) {
            EXPECT_EQ(r, 0);
            break;
        }
        ++nFailed;
        const std::string op = szFailed;
        const std::string file = xavo::test::ReadFile(kConf);
        // Failures the set rides out (a lock try that is repeated, a read
        // of the old section that comes back empty) must still store the
        // new account; every other failure leaves the old file.
        if (r == 0) {
            EXPECT_THAT(file, HasSubstr("new@example.com")) << op;
        } else {
            EXPECT_LT(r, 0) << op;
            EXPECT_EQ(file, oldFile) << op;
        }
        EXPECT_THAT(file, Not(HasSubstr(kToken))) << op;
        int fd = XAVOPrinterPrinterConfLock();
        EXPECT_GE(fd, 0) << "lock left held after " << op;
        XAVOPrinterPrinterConfUnlock(fd);
        Logs();
    }
    EXPECT_GT(nFailed, 4);

    for (int n = 1; n < 200; ++n) {
        XavoStandinReset();
        XavoStandinFailCall("*", n, kInjected);
        PrinterGoogleInfo out = Junk();
        int32_t r = XAVOPrinterGoogleInfoGet(&out);
        const char *szFailed = XavoStandinLastFailed();
        const uint32_t uCode = ORLICErrGet();
        XavoStandinReset();
        if (szFailed == nullptr) {
            EXPECT_EQ(r, 0);
            break;
        }
        EXPECT_EQ(r, -1) << szFailed;
        EXPECT_EQ(out.szPassword[0], '\0') << szFailed;
        EXPECT_EQ(out.szRefreshToken[0], '\0') << szFailed;
        if (std::string(szFailed) == "ORLICSzHashAlloc") {
            EXPECT_EQ(uCode, ERR_OUT_OF_MEMORY);
        }
        Logs();
    }
}

}  // namespace
