#include <syslog.h>

#include <cstring>
#include <string_view>

#include "cups/queue_create.h"
#include "cups/queue_list.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_cups_name_and_ip_check";
constexpr char kLogNotRunning[] = "%s:%d %s is not running.";
constexpr char kLogEnumFailed[] = "%s:%d Failed to Enum Printers.[0x%04X %s:%d]";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetCupsNameAndIPCheck(const char *szIP, const char *szCupsPrinterName) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") || !XARG_OK(szIP[0] != '\0', "0 != szIP[0]") ||
            !XARG_OK(szCupsPrinterName != nullptr, "((void *)0) != szCupsPrinterName") ||
            !XARG_OK(szCupsPrinterName[0] != '\0', "0 != szCupsPrinterName[0]")) {
            return -1;
        }
        if (!xavo::SchedulerRunning()) {
            XLOG(LOG_ERR, kLogNotRunning, xavo::kSchedulerService);
            return 0;
        }
        int32_t iCount = xavo::CountAllPrinters(kLogEnumFailed, kUnit, __LINE__);
        if (iCount <= 0) return iCount;
        const xavo::AddressPattern pattern(szIP);
        // The first queue whose whole name is the one asked for decides: 1
        // when its device URI carries the address, 2 when it serves another
        // device.
        return xavo::CheckQueueList(
            0,
            [&](const char *szLine) {
                if (xavo::QueueNameOfLine(szLine) != std::string_view(szCupsPrinterName)) return -1;
                return std::strstr(szLine, pattern.sz) != nullptr ? 1 : 2;
            },
            kUnit, __LINE__);
    });
}
