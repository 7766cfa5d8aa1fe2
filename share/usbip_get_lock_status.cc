// Reads a printer's USB/IP lock status from the sharing service's status
// file.
#include <cstdio>

#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/name_path.h"
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
        // A printer ID that holds "/" would read another directory's file,
        // and one too long for the 4096-byte path is refused rather than
        // cut into another printer's status file.
        char szPath[kPathSize];
        if (szBuf == nullptr || cbBuf <= 0 || szPrinterId == nullptr ||
            !xavo::NamePath(szPath, xavo::kUsbipStatus, szPrinterId)) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        // The service's text is passed through unchanged, whatever it is.
        if (ORLICFileGetKeyValue(szPath, kKeyLock, szBuf, cbBuf, 0) < 0) xavo::CopyText(szBuf, cbBuf, kLockFree);
        return 0;
    });
}
