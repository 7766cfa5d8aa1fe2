// Stores the cloud print account, its secret enciphered.
#include <syslog.h>

#include <string>

#include "conf/conf_paths.h"
#include "conf/conf_section.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "share/google_info_section.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_google_info_set";
constexpr char kLogNoAccount[] = "%s:%d google account can't be empty";
constexpr char kLogEncryptFailed[] = "%s:%d encrypt failed";
constexpr char kLogNoPassword[] = "%s:%d password can't be empty";
constexpr char kLogNoToken[] = "%s:%d refresh token can't be empty";

// Enciphers a record field into cipher; the field is copied first so that
// a caller's unterminated field is never read past its end.  False when the
// cipher fails.
template <size_t N>
bool Encipher(const char (&field)[N], xavo::SecretBuf<xavo::kCipherBufSize> &cipher) {
    xavo::SecretBuf<N + 1> clear;
    xavo::CopyText(clear.get(), clear.size(), xavo::FieldText(field));
    if (ORLICCryptSzEncrypt(clear.get(), cipher.get(), cipher.size()) == 0) {
        XLOG(LOG_ERR, kLogEncryptFailed);
        return false;
    }
    return true;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterGoogleInfoSet(const PrinterGoogleInfo *pInfo) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (pInfo == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        xavo::SzHash hash(ORLICSzHashAlloc(512));
        if (!hash) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        // Keys of the section this library does not know are kept.  The
        // read is outside the printer lock, which is held around the write
        // only: the write replaces just this section in a fresh read of the
        // file, so writers of other printers' sections lose nothing; only
        // two account changes at once could drop each other's unknown keys,
        // and the web administration, the one writer of the account, makes
        // them one at a time.
        ORLICFileGetSection(xavo::kPrinterConfPath, xavo::kGoogleSection, hash.addr());

        const std::string account(xavo::FieldText(pInfo->szAccount));
        if (account.empty() || ORLICSzHashSetValue(hash.addr(), xavo::kKeyGoogleAccount, account.c_str()) < 0) {
            XLOG(LOG_ERR, kLogNoAccount);
            return -1;
        }

        xavo::SecretBuf<xavo::kCipherBufSize> cipher;
        if (pInfo->szPassword[0] != '\0') {
            if (!Encipher(pInfo->szPassword, cipher)) return -1;
            if (cipher.get()[0] == '\0' ||
                ORLICSzHashSetValue(hash.addr(), xavo::kKeyGooglePass, cipher.get()) < 0) {
                XLOG(LOG_ERR, kLogNoPassword);
                return -1;
            }
            // A token stored earlier stays beside the password, which is
            // the one in force.
        } else {
            if (!Encipher(pInfo->szRefreshToken, cipher)) return -1;
            if (cipher.get()[0] == '\0' ||
                ORLICSzHashSetValue(hash.addr(), xavo::kKeyRefreshToken, cipher.get()) < 0) {
                XLOG(LOG_ERR, kLogNoToken);
                return -1;
            }
            ORLICSzHashRemoveKey(hash.get(), xavo::kKeyGooglePass);
        }

        xavo::PrinterLock lock;
        if (!lock.held()) {
            XSETERR(ERR_LOCK);
            return -1;
        }
        return XWRITE_CONF_SECTION(xavo::kGoogleSection, hash.get());
    });
}
