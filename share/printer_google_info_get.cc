// Reads the cloud print account, deciphering its secret.
#include <syslog.h>

#include <cstring>

#include "conf/conf_paths.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "share/google_info_section.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_google_info_get";
constexpr char kLogDecryptFailed[] = "%s:%d decrypt failed";
constexpr char kLogNoSecret[] = "%s:%d Can't get password and refresh_token";

// A stored key with an empty value counts as absent: the setter never
// stores an empty cipher text, and an empty one cannot be deciphered, so
// an emptied "google pass" must not hide a token stored beside it.
const char *StoredValue(const xavo::SzHash &hash, const char *szKey) {
    const char *szValue = ORLICSzHashGetValue(hash.get(), szKey);
    return (szValue != nullptr && szValue[0] != '\0') ? szValue : nullptr;
}

// Deciphers szCipher into the record's field; false when the cipher
// refuses it (wrong key, damaged text).
template <size_t N>
bool Decipher(const char *szCipher, char (&field)[N]) {
    xavo::SecretBuf<xavo::kCipherBufSize> clear;
    if (ORLICCryptSzDecrypt(szCipher, clear.get(), clear.size()) == 0) {
        XLOG(LOG_ERR, kLogDecryptFailed);
        return false;
    }
    xavo::CopyText(field, std::string_view(clear.get(), strnlen(clear.get(), clear.size())));
    return true;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterGoogleInfoGet(PrinterGoogleInfo *pInfo) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (pInfo == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        std::memset(pInfo, 0, sizeof *pInfo);
        xavo::SzHash hash(ORLICSzHashAlloc(512));
        if (!hash) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        // A missing file or section shows up as missing keys below.
        ORLICFileGetSection(xavo::kPrinterConfPath, xavo::kGoogleSection, hash.addr());

        const char *szAccount = StoredValue(hash, xavo::kKeyGoogleAccount);
        if (szAccount == nullptr) return -1;
        xavo::CopyText(pInfo->szAccount, szAccount);

        // A password stored over an earlier token is the one in force.
        if (const char *szPass = StoredValue(hash, xavo::kKeyGooglePass)) {
            return Decipher(szPass, pInfo->szPassword) ? 0 : -1;
        }
        if (const char *szToken = StoredValue(hash, xavo::kKeyRefreshToken)) {
            return Decipher(szToken, pInfo->szRefreshToken) ? 0 : -1;
        }
        XLOG(LOG_ERR, kLogNoSecret);
        return -1;
    });
}
