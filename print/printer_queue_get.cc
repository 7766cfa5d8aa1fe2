// The queue text the USB/IP sharing service keeps for a printer, with its
// remark renamed to point at the CUPS jobs.
#include <syslog.h>

#include <cstdio>
#include <cstring>
#include <string_view>

#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/name_path.h"
#include "internal/text.h"
#include "share/usbip_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_queue_get";
constexpr char kLogGetQueueFailed[] = "%s:%d get queue failed, printer=%s";
constexpr char kLogCannotRefine[] = "%s:%d cannot refine printer queue name";

constexpr char kKeyQueue[] = "QUEUE";
constexpr char kCupsJobsRemark[] = "(CUPS Jobs";
constexpr size_t kPathSize = 256;
constexpr char kCondNoSlash[] = "((void *)0) == strchr(szPrinterId, '/')";
constexpr char kCondPathFits[] = "sizeof(szPath) > snprintf(szPath, sizeof(szPath), \"/tmp/usbip_%s\", szPrinterId)";
constexpr size_t kValueSize = 4096;
// The remark's opening part that is replaced: "(" and at most six more
// characters, so a longer remark keeps its tail behind the new text.
constexpr size_t kTagSize = 8;

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterQueueGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szPrinterId != nullptr, "((void *)0) != szPrinterId") ||
            !XARG_OK(szPrinterId[0] != '\0', "0 != szPrinterId[0]") ||
            !XARG_OK(szBuf != nullptr, "((void *)0) != szBuf") || !XARG_OK(cbBuf > 0, "0 < cbBuf")) {
            return -1;
        }
        // The status file's path is built in 256 bytes: a printer ID that
        // holds "/" or does not fit whole is refused rather than cut into
        // another file's name.
        char szPath[kPathSize];
        if (!XARG_OK(xavo::IsBaseName(szPrinterId), kCondNoSlash) ||
            !XARG_OK(xavo::NamePath(szPath, xavo::kUsbipStatus, szPrinterId), kCondPathFits)) {
            return -1;
        }

        char szValue[kValueSize];
        std::memset(szValue, 0, sizeof szValue);
        if (ORLICFileGetKeyValue(szPath, kKeyQueue, szValue, static_cast<int32_t>(sizeof szValue), 0) < 0) {
            XLOG(LOG_ERR, kLogGetQueueFailed, szPrinterId);
            return -1;
        }

        const std::string_view value(szValue, strnlen(szValue, sizeof szValue));
        const size_t nOpen = value.find('(');
        if (nOpen == std::string_view::npos) {
            xavo::CopyText(szBuf, cbBuf, value);
            return 0;
        }
        const size_t nClose = value.find(')');
        // A ")" that comes before the "(" closes nothing: such a value is
        // shown as it is rather than guessing where its remark ends.
        if (nClose == std::string_view::npos || nClose < nOpen) {
            XLOG(LOG_ERR, kLogCannotRefine);
            xavo::CopyText(szBuf, cbBuf, value);
            return 0;
        }
        char szTag[kTagSize];
        xavo::CopyText(szTag, value.substr(nOpen, nClose - nOpen));
        if (ORLICStrReplace(szValue, szTag, kCupsJobsRemark, szBuf, cbBuf) > 0) return 0;

        XLOG(LOG_ERR, kLogCannotRefine);
        xavo::CopyText(szBuf, cbBuf, value);
        return 0;
    });
}
