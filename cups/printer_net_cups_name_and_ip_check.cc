#include <syslog.h>

#include <cstdio>
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
constexpr char kIpPatternFormat[] = "/%s/";
constexpr int kPatternSize = 32;
constexpr int32_t kAllPrinters = XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET;

// The first queue whose whole name is the one asked for decides: 1 when its
// device URI carries the address, 2 when it serves another device.
class NameAddressRule final : public xavo::QueueListRule {
public:
    NameAddressRule(const char *szCupsPrinterName, const char *szIpPattern)
        : szName_(szCupsPrinterName), szIpPattern_(szIpPattern) {}
    bool Begin(const FILE *pPipe) override {
        iAnswer_ = 0;
        return XARG_OK(pPipe != nullptr, "((void *)0) != pPipe") &&
               XARG_OK(szName_ != nullptr, "((void *)0) != szCupsPrinterName") &&
               XARG_OK(szIpPattern_ != nullptr, "NULL != szIpPattern");
    }
    bool Line(const char *szLine) override {
        if (xavo::QueueNameOfLine(szLine) != std::string_view(szName_)) return false;
        iAnswer_ = std::strstr(szLine, szIpPattern_) != nullptr ? 1 : 2;
        return true;
    }
    int32_t answer() const { return iAnswer_; }

private:
    const char *szName_;
    const char *szIpPattern_;
    int32_t iAnswer_ = 0;
};
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
        int32_t iCount = XAVOPrinterEnumCount(kAllPrinters, nullptr);
        if (iCount < 0) {
            XLOG(LOG_ERR, kLogEnumFailed, XERR_TAIL);
            return -1;
        }
        if (iCount == 0) return 0;
        char szIpPattern[kPatternSize] = {};
        std::snprintf(szIpPattern, sizeof szIpPattern, kIpPatternFormat, szIP);
        NameAddressRule rule(szCupsPrinterName, szIpPattern);
        if (!xavo::ReadQueueList(rule)) {
            XSETERR(ERR_EXEC);
            return -1;
        }
        return rule.answer();
    });
}
