#include <syslog.h>

#include <cstring>

#include "cups/queue_create.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_printer_rm_by_name";
constexpr char kLogExecFailed[] = "%s:%d Execute error, cmd=%s -x %s";

// lpadmin's own refusals (no such queue) are not failures of the removal:
// only a runner that could not run the tool is.
bool RemoveQueue(const char *szName) {
    if (ORLICExec(xavo::kLpadminPath, "-x", szName, nullptr, nullptr) >= 0) return true;
    XLOG(LOG_ERR, kLogExecFailed, xavo::kLpadminPath, szName);
    return false;
}
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsRmByName(const char *szCupsPrinterName) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szCupsPrinterName != nullptr, "((void *)0) != szCupsPrinterName") ||
            !XARG_OK(szCupsPrinterName[0] != '\0', "0 != szCupsPrinterName[0]")) {
            return -1;
        }
        if (!RemoveQueue(szCupsPrinterName)) return -1;
        // Unlike enabling, removal matches the name exactly: only the queue
        // the library itself named "usbprinter1" owns the alias.
        if (std::strcmp(szCupsPrinterName, xavo::kFirstUsbQueue) == 0 && !RemoveQueue(xavo::kUsbQueueAlias)) return -1;
        return 0;
    });
}
