#include <syslog.h>

#include <cstdio>
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
constexpr char kIpPatternFormat[] = "/%s/";
constexpr int kPatternSize = 32;
constexpr int32_t kAllPrinters = XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET;

// Network queues carry the address between slashes ("socket://ADDR/queue"),
// so "/ADDR/" never matches inside a longer address.
class AddressRule final : public xavo::QueueListRule {
public:
    explicit AddressRule(const char *szIpPattern) : szIpPattern_(szIpPattern) {}
    bool Begin(const FILE *pPipe) override {
        iAnswer_ = 1;
        return XARG_OK(pPipe != nullptr, "((void *)0) != pPipe") &&
               XARG_OK(szIpPattern_ != nullptr, "NULL != szIpPattern");
    }
    bool Line(const char *szLine) override {
        if (std::strstr(szLine, szIpPattern_) == nullptr) return false;
        iAnswer_ = 0;
        return true;
    }
    int32_t answer() const { return iAnswer_; }

private:
    const char *szIpPattern_;
    int32_t iAnswer_ = 1;
};
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetIPCheck(const char *szIP) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP")) return -1;
        if (!xavo::SchedulerRunning()) {
            XLOG(LOG_DEBUG, kLogNotRunning, xavo::kSchedulerService);
            return 1;
        }
        int32_t iCount = XAVOPrinterEnumCount(kAllPrinters, nullptr);
        if (iCount < 0) {
            XLOG(LOG_ERR, kLogEnumFailed, XERR_TAIL);
            return -1;
        }
        if (iCount == 0) return 1;
        // An address too long for the pattern loses its closing slash; the
        // appliance's callers pass dotted IPv4 addresses, which always fit.
        char szIpPattern[kPatternSize] = {};
        std::snprintf(szIpPattern, sizeof szIpPattern, kIpPatternFormat, szIP);
        AddressRule rule(szIpPattern);
        if (!xavo::ReadQueueList(rule)) {
            XSETERR(ERR_EXEC);
            return -1;
        }
        return rule.answer();
    });
}
