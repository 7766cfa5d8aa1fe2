// Reads a printer's USB/IP lock status from the sharing service's status
// file.
#include <cstdio>

#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/text.h"
#include "share/usbip_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "usbip_get_lock_status";
constexpr char kKeyLock[] = "LOCK";
// What a printer without a status file (or without the key) is.
constexpr char kLockFree[] = "Free";
constexpr size_t kPathSize = 4096;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterUsbipGetLockStatus(const char *szPrinterId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szBuf == nullptr || cbBuf <= 0 || szPrinterId == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szPath[kPathSize];
        std::snprintf(szPath, sizeof szPath, xavo::kUsbipStatusFormat, szPrinterId);
        // The service's text is passed through unchanged, whatever it is.
        if (ORLICFileGetKeyValue(szPath, kKeyLock, szBuf, cbBuf, 0) < 0) xavo::CopyText(szBuf, cbBuf, kLockFree);
        return 0;
    });
}
