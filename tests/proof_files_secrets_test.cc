// Proof that the cloud account's secrets stay secret: never in clear in the
// printer configuration file, the log, a process's arguments or a file
// others can read, and a stored secret that was changed in any way never
// opens.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"
#include "support/paths.h"
#include "support/proof_tally.h"
#include "support/records.h"
#include "support/sections.h"
#include "xavoprinter.h"

using namespace xavo::test;

namespace {

constexpr char kSection[] = "Google Cloud Print";
constexpr char kCanaryPassword[] = "Canary-Pw-7f3a9c01";
constexpr char kCanaryToken[] = "1//Canary-Token-51d2e8aa";
constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
// The trees where the library and the platform write, in the sandbox.
constexpr const char *kWrittenTrees[] = {"/usr/xavo", "/etc/cups", "/etc/samba", "/tmp", "/run", "/var/services"};

bool HoldsCanary(const std::string &text) {
    return text.find(kCanaryPassword) != std::string::npos || text.find(kCanaryToken) != std::string::npos;
}

bool SetCloud(const char *szPassword, const char *szToken) {
    const PrinterGoogleInfo info = CloudRecord("owner@example.com", szPassword, szToken);
    return XAVOPrinterGoogleInfoSet(&info) == 0;
}

bool Opens(const std::string &cipher) {
    char clear[512];
    return ORLICCryptSzDecrypt(cipher.c_str(), clear, sizeof clear) != 0;
}

// Every change of a stored text: each other byte value at each position,
// each shorter text down to the empty one, each character appended.
std::vector<std::string> Damaged(const std::string &text) {
    std::vector<std::string> out;
    for (size_t i = 0; i < text.size(); ++i) {
        for (int b = 1; b < 256; ++b) {
            if (static_cast<char>(b) == text[i]) continue;
            out.push_back(text);
            out.back()[i] = static_cast<char>(b);
        }
        out.push_back(text.substr(0, i));
    }
    for (const char *c = kAlphabet; *c != '\0'; ++c) out.push_back(text + *c);
    return out;
}

// Arguments of every process of the sandbox, sampled while a child sets and
// reads the account over and over.
void CheckArgumentsWhileInUse(Tally *pTally) {
    const pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) {
        PrinterGoogleInfo info;
        for (int i = 0; i < 200; ++i) {
            SetCloud(kCanaryPassword, "");
            XAVOPrinterGoogleInfoGet(&info);
        }
        _exit(0);
    }
    for (int sample = 0; sample < 10000 && waitpid(pid, nullptr, WNOHANG) == 0; ++sample) {
        for (const SandboxProcess &p : Descendants()) {
            const std::string argv = ReadFile("/proc/" + std::to_string(p.pid) + "/cmdline");
            EXPECT_TRUE(pTally->Check(!HoldsCanary(argv))) << p.comm;
        }
    }
    waitpid(pid, nullptr, 0);
}

void CheckWorldReadableFiles(Tally *pTally) {
    namespace fs = std::filesystem;
    for (const char *szTree : kWrittenTrees) {
        std::error_code error;
        for (fs::recursive_directory_iterator it(szTree, fs::directory_options::skip_permission_denied, error), end;
             !error && it != end; it.increment(error)) {
            struct stat st {};
            if (lstat(it->path().c_str(), &st) != 0 || !S_ISREG(st.st_mode) || st.st_size > 1024 * 1024) continue;
            if ((st.st_mode & S_IROTH) == 0) continue;
            EXPECT_TRUE(pTally->Check(!HoldsCanary(ReadFile(it->path())))) << it->path();
        }
    }
}

TEST(FileSecretProofs, SecretsNeverShowInClearAndDamagedOnesNeverOpen) {
    Tally tally{"secrets"};
    ASSERT_TRUE(SetCloud("", kCanaryToken));
    ASSERT_TRUE(SetCloud(kCanaryPassword, ""));
    Section stored = ReadSection(kConf, kSection);
    const std::string pass = stored["google pass"], token = stored["refresh token"];
    ASSERT_TRUE(Opens(pass) && Opens(token)) << "both secrets stored";

    CheckArgumentsWhileInUse(&tally);
    EXPECT_TRUE(tally.Check(!HoldsCanary(ReadFile(kConf))));
    CheckWorldReadableFiles(&tally);
    struct stat key {};
    EXPECT_TRUE(tally.Check(lstat("/usr/xavo/etc/.printer_secret.key", &key) == 0 && (key.st_mode & 077) == 0));

    for (const std::string &secret : {pass, token}) {
        for (const std::string &damaged : Damaged(secret)) {
            if (!tally.Check(!Opens(damaged))) ADD_FAILURE() << "opened: " << damaged;
        }
    }
    // Every line logged while the secrets were set and read, and while
    // damaged ones were refused.
    for (const LogLine &line : TakeLogs()) {
        EXPECT_TRUE(tally.Check(!HoldsCanary(line.message))) << line.message;
    }
}

}  // namespace
