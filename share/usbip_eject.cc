// Asks the driver binding tool to take a printer out of USB/IP sharing.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "share/usbip_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "usbip_eject";
constexpr char kLogEjectFailed[] = "%s:%d release usb ap lock failed, printerId=%s";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterUsbipEject(const char *szPrinterId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szPrinterId[0] == '\0') {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        // The printer ID goes to the tool as one argument, colons and all.
        if (ORLICExec(xavo::kBindDriver, "-z", szPrinterId, nullptr, nullptr) != 0) {
            XLOG(LOG_ERR, kLogEjectFailed, szPrinterId);
            return -1;
        }
        return 0;
    });
}
