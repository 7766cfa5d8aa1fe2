// Opens a usblp device node, waiting a bounded time while it is busy (a
// print job holds it, for instance).
#include <fcntl.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_device_open";
constexpr char kLogBadParameter[] = "%s:%d bad parameter.";
constexpr char kLogReachMax[] = "%s:%d %s device open fail reach max, abort.";
constexpr char kLogBusy[] = "%s:%d %s device busy, retring...";
constexpr char kDevPrefix[] = "/dev/";
constexpr char kUsbDevFormat[] = "/dev/usb/%s";
constexpr size_t kPathSize = 256;
constexpr unsigned kBusyPauseSeconds = 1;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterDevOpen(const char *szDevName, int32_t nRetry) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szDevName == nullptr) {
            XLOG(LOG_ERR, kLogBadParameter);
            return -1;
        }
        char szPath[kPathSize];
        if (std::strncmp(szDevName, kDevPrefix, sizeof kDevPrefix - 1) == 0) {
            std::snprintf(szPath, sizeof szPath, "%s", szDevName);
        } else {
            std::snprintf(szPath, sizeof szPath, kUsbDevFormat, szDevName);
        }
        for (int32_t retries = 0;; ++retries) {
            int fd = open(szPath, O_RDONLY);
            if (fd >= 0) return fd;
            const int err = errno;
            if (err != EBUSY) return -1;
            if (retries >= nRetry) {
                XLOG(LOG_ERR, kLogReachMax, szDevName);
                // The callers report the open failure with errno: keep
                // the open's, not whatever logging left behind.
                errno = err;
                return -1;
            }
            XLOG(LOG_DEBUG, kLogBusy, szDevName);
            sleep(kBusyPauseSeconds);
        }
    });
}
