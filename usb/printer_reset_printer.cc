// Soft-resets a usblp printer.
#include <sys/ioctl.h>
#include <syslog.h>

#include <cerrno>

#include "internal/boundary.h"
#include "internal/errno_text.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "usb/usblp.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_reset_printer";
constexpr char kLogOpenFailed[] = "%s:%d open device [%s] error:(%d) %s";
constexpr char kLogResetFailed[] = "%s:%d ioctl LPIOC_SOFT_RESET error:(%d) %s";
}  // namespace

XAVO_EXPORT int32_t XAVOResetPrinter(const char *szDevName) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        xavo::Fd fd(XAVOPrinterDevOpen(szDevName, xavo::kUsblpOpenRetries));
        if (!fd) {
            const int err = errno;
            XLOG(LOG_ERR, kLogOpenFailed, szDevName ? szDevName : "(null)", err, xavo::ErrnoText(err).c_str());
            return -1;
        }
        if (ioctl(fd.get(), xavo::kLpiocSoftReset) < 0) {
            const int err = errno;
            XLOG(LOG_ERR, kLogResetFailed, err, xavo::ErrnoText(err).c_str());
            return -1;
        }
        return 0;
    });
}
