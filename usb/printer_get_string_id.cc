// Reads a usblp printer's IEEE 1284 device ID string.
#include <sys/ioctl.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>

#include "internal/boundary.h"
#include "internal/errno_text.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "usb/usblp.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_get_string_id";
constexpr char kLogOpenFailed[] = "%s:%d open device [%s] error:(%d) %s";
constexpr char kLogRequestRetry[] = "%s:%d ioctl LPIOC_GET_DEVICE_ID error:(%d) %s, retry: %d";
constexpr char kLogRequestFailed[] = "%s:%d ioctl LPIOC_GET_DEVICE_ID error:(%d) %s";
constexpr int kRequestAttempts = 8;
constexpr unsigned kRequestPauseSeconds = 1;
constexpr size_t kLengthBytes = 2;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterGetStringId(const char *szDevName, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        xavo::Fd fd(XAVOPrinterDevOpen(szDevName, xavo::kUsblpOpenRetries));
        if (!fd) {
            const int err = errno;
            XLOG(LOG_DEBUG, kLogOpenFailed, szDevName ? szDevName : "(null)", err, xavo::ErrnoText(err).c_str());
            return -1;
        }
        // Zeroed so that a reply shorter than the buffer reads as a
        // terminated text.
        unsigned char abReply[xavo::kUsblpDeviceIdSize] = {};
        bool bAnswered = false;
        int err = 0;
        for (int attempt = 0; attempt < kRequestAttempts; ++attempt) {
            if (ioctl(fd.get(), xavo::kLpiocGetDeviceId, abReply) == 0) {
                bAnswered = true;
                break;
            }
            err = errno;
            XLOG(LOG_ERR, kLogRequestRetry, err, xavo::ErrnoText(err).c_str(), attempt);
            sleep(kRequestPauseSeconds);
        }
        if (!bAnswered) {
            XLOG(LOG_ERR, kLogRequestFailed, err, xavo::ErrnoText(err).c_str());
            return -1;
        }
        const int32_t iStated = (int32_t{abReply[0]} << 8) | int32_t{abReply[1]};
        // The device states the length, not the buffer: a reply that fills
        // the whole buffer holds no NUL, and a stated length may exceed
        // what was read.  Never look beyond the reply buffer.
        const char *pText = reinterpret_cast<const char *>(abReply + kLengthBytes);
        const size_t cbText = sizeof abReply - kLengthBytes;
        xavo::CopyText(szBuf, cbBuf, std::string_view(pText, strnlen(pText, cbText)));
        return iStated > cbBuf ? iStated : 0;
    });
}
