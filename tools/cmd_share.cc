// share status, cloud get and set, usbip eject, lock-status, release.
#include <string.h>

#include <memory>

#include "checks.h"
#include "commands.h"
#include "report.h"
#include "secret_prompt.h"
#include "xavoprinter.h"

namespace cli {
namespace {

// Widths of the cloud print record's fields, minus the terminating NUL:
// a longer text would be stored cut, which for a secret means a wrong one.
constexpr size_t kMaxAccount = sizeof(PrinterGoogleInfo::szAccount) - 1;
constexpr size_t kMaxPassword = sizeof(PrinterGoogleInfo::szPassword) - 1;
constexpr size_t kMaxToken = sizeof(PrinterGoogleInfo::szRefreshToken) - 1;

// The record wiped on every way out: it holds a secret in clear.
struct WipedInfo {
    PrinterGoogleInfo info{};
    WipedInfo() = default;
    WipedInfo(const WipedInfo &) = delete;
    WipedInfo &operator=(const WipedInfo &) = delete;
    ~WipedInfo() { explicit_bzero(&info, sizeof info); }
};

struct CloudArgs {
    std::string account;
    bool bToken = false;
    bool bReveal = false;
};

int ShareStatus(const Registry &reg) {
    Report r(reg.bJson, {"printers_share_active"});
    r.Set("printers_share_active", XAVOPrinterIsActive() == 1);
    return r.Succeed();
}

int CloudGet(const Registry &reg, bool bReveal) {
    Report r(reg.bJson, {"account", "secret_in_force", "secret"});
    WipedInfo w;
    ResetPlatformError();
    if (XAVOPrinterGoogleInfoGet(&w.info) != 0) {
        // The library sets no code of its own for a missing account; one
        // left by its read of a missing file would only mislead.
        if (w.info.szAccount[0] == '\0') return r.FailWithoutCode("no cloud print account is stored");
        r.Set("account", w.info.szAccount);
        return r.Fail(std::string("the cloud print account ") + w.info.szAccount +
                      " has no readable password or refresh token");
    }
    const bool bPassword = w.info.szPassword[0] != '\0';
    r.Set("account", w.info.szAccount);
    r.Set("secret_in_force", bPassword ? "password" : "refresh token");
    if (bReveal) r.Set("secret", bPassword ? w.info.szPassword : w.info.szRefreshToken);
    return r.Succeed();
}

int CloudSet(const Registry &reg, const CloudArgs &a) {
    Report r(reg.bJson, {"account", "stored"});
    r.Set("account", a.account);
    const char *what = a.bToken ? "refresh token" : "password";
    std::string why;
    std::optional<Secret> secret = ReadSecret(what, a.bToken ? kMaxToken : kMaxPassword, why);
    if (!secret) return r.FailWithoutCode(why + "; nothing was stored");
    WipedInfo w;
    std::memcpy(w.info.szAccount, a.account.c_str(), a.account.size());
    char *field = a.bToken ? w.info.szRefreshToken : w.info.szPassword;
    std::memcpy(field, secret->text().c_str(), secret->text().size());
    ResetPlatformError();
    if (XAVOPrinterGoogleInfoSet(&w.info) != 0) return r.Fail("could not store the cloud print account");
    r.Set("stored", what);
    return r.Succeed();
}

int UsbipHook(const Registry &reg, const std::string &id, bool bEject) {
    Report r(reg.bJson, {"printer_id", bEject ? "ejected" : "released"});
    r.Set("printer_id", id);
    ResetPlatformError();
    const int32_t res = bEject ? XAVOPrinterUsbipEject(id.c_str()) : XAVOPrinterUsbipLockRelease(id.c_str());
    r.Set(bEject ? "ejected" : "released", res == 0);
    if (res != 0) {
        return r.Fail(std::string("bind_driver could not ") + (bEject ? "eject " : "release the USB/IP lock of ") + id);
    }
    return r.Succeed();
}

int UsbipLockStatus(const Registry &reg, const std::string &id) {
    Report r(reg.bJson, {"printer_id", "lock"});
    r.Set("printer_id", id);
    char szStatus[256] = {};
    ResetPlatformError();
    if (XAVOPrinterUsbipGetLockStatus(id.c_str(), szStatus, sizeof szStatus) != 0) {
        return r.Fail("could not read the USB/IP lock of " + id);
    }
    r.Set("lock", szStatus);
    return r.Succeed();
}

}  // namespace

void AddShareCommands(CLI::App &app, Registry &reg) {
    CLI::App *share = app.add_subcommand("share", "the Samba printers share");
    CLI::App *status = share->add_subcommand("status", "whether the Samba printers share is set up");
    reg.On(status, "xavoprinter share status", [&reg] { return ShareStatus(reg); });

    auto c = std::make_shared<CloudArgs>();
    CLI::App *cloud = app.add_subcommand("cloud", "the cloud print account");
    CLI::App *get = cloud->add_subcommand("get", "the cloud print account and which secret is in force");
    get->add_flag("--reveal", c->bReveal, "also print the secret");
    reg.On(get, "xavoprinter cloud get", [&reg, c] { return CloudGet(reg, c->bReveal); });
    CLI::App *set = cloud->add_subcommand(
        "set", "store the cloud print account; the secret is read from a prompt or one line of standard input\n"
               "(password at most 127 characters, refresh token at most 255; never empty)");
    set->add_option("ACCOUNT", c->account, "account name")->required()->check(Text(kMaxAccount));
    set->add_flag("--token", c->bToken, "the secret is a refresh token (default: a password)");
    reg.On(set, "printf '%s\\n' \"$TOKEN\" | xavoprinter cloud set user@example.com --token",
           [&reg, c] { return CloudSet(reg, *c); });

    auto id = std::make_shared<std::string>();
    CLI::App *usbip = app.add_subcommand("usbip", "the USB/IP sharing hooks");
    for (const bool bEject : {true, false}) {
        const std::string verb = bEject ? "eject" : "release";
        reg.Leaf(usbip, verb, bEject ? "eject a printer from USB/IP sharing" : "release a printer's USB/IP lock",
                 Arg::kPrinterId, *id, "xavoprinter usbip " + verb + " 04b8:0005:SN0001",
                 [&reg, id, bEject] { return UsbipHook(reg, *id, bEject); });
    }
    reg.Leaf(usbip, "lock-status", "a printer's USB/IP lock status", Arg::kPrinterId, *id,
             "xavoprinter usbip lock-status 04b8:0005:SN0001", [&reg, id] { return UsbipLockStatus(reg, *id); });
}

}  // namespace cli
