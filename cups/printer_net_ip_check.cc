#include <syslog.h>

#include <cstring>

#include "cups/queue_create.h"
#include "cups/queue_list.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_ip_check";
constexpr char kLogNotRunning[] = "%s:%d %s is not running.";
constexpr char kLogEnumFailed[] = "%s:%d Failed to Enum Printers.[0x%04X %s:%d]";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetIPCheck(const char *szIP) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP")) return -1;
        if (!xavo::SchedulerRunning()) {
            XLOG(LOG_DEBUG, kLogNotRunning, xavo::kSchedulerService);
            return 1;
        }
        int32_t iCount = xavo::CountAllPrinters(kLogEnumFailed, kUnit, __LINE__);
        if (iCount <= 0) return iCount < 0 ? -1 : 1;
        const xavo::AddressPattern pattern(szIP);
        return xavo::CheckQueueList(
            1, [&](const char *szLine) { return std::strstr(szLine, pattern.sz) != nullptr ? 0 : -1; }, kUnit,
            __LINE__);
    });
}
