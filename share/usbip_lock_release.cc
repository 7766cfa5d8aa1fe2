// Asks the driver binding tool to release a printer's USB/IP lock.
#include <syslog.h>

#include <cstdio>

#include "internal/boundary.h"
#include "internal/log.h"
#include "share/usbip_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "usbip_lock_release";
constexpr char kLogReleaseFailed[] = "%s:%d release usb ap lock failed, cmd=%s";

// Only for the log line: the tool itself is given an argument vector.
constexpr char kCommandFormat[] = "/usr/bin/bind_driver -p %s -0 %d -n %s";
constexpr size_t kCommandSize = 512;
constexpr int kLockOwner = 0;
constexpr char kLockOwnerText[] = "0";
constexpr char kLockName[] = "USBIP";
// The platform's option word for this tool; its bits are the platform's.
constexpr uint32_t kExecOptions = 0xBB;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterUsbipLockRelease(const char *szPrinterId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szPrinterId[0] == '\0') {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szCommand[kCommandSize];
        std::snprintf(szCommand, sizeof szCommand, kCommandFormat, szPrinterId, kLockOwner, kLockName);
        if (ORLICExecl(xavo::kBindDriver, kExecOptions, "-p", szPrinterId, "-0", kLockOwnerText, "-n", kLockName,
                       static_cast<const char *>(nullptr)) != 0) {
            XLOG(LOG_ERR, kLogReleaseFailed, szCommand);
            return -1;
        }
        return 0;
    });
}
