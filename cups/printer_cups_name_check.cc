#include <syslog.h>

#include <cstring>

#include "cups/queue_create.h"
#include "cups/queue_list.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_name_check";
constexpr char kLogNotRunning[] = "%s:%d %s is not running.";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsNameCheck(const char *szPrinterId, const char *szCupsPrinterName) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szPrinterId != nullptr, "((void *)0) != szPrinterId") ||
            !XARG_OK(szPrinterId[0] != '\0', "0 != szPrinterId[0]") ||
            !XARG_OK(szCupsPrinterName != nullptr, "((void *)0) != szCupsPrinterName") ||
            !XARG_OK(szCupsPrinterName[0] != '\0', "0 != szCupsPrinterName[0]")) {
            return -1;
        }
        if (!xavo::SchedulerRunning()) {
            XLOG(LOG_ERR, kLogNotRunning, xavo::kSchedulerService);
            return 0;
        }
        // The first line that names the queue decides: it is this printer's
        // when the line (its device URI) also carries the printer ID.
        return xavo::CheckQueueList(
            0,
            [&](const char *szLine) {
                if (std::strstr(szLine, szCupsPrinterName) == nullptr) return -1;
                return std::strstr(szLine, szPrinterId) != nullptr ? 1 : 2;
            },
            kUnit, __LINE__);
    });
}
