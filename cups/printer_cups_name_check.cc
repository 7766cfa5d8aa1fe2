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

// The first line that names the queue decides: it is this printer's when
// the line (its device URI) also carries the printer ID.
class NameRule final : public xavo::QueueListRule {
public:
    NameRule(const char *szPrinterId, const char *szCupsPrinterName)
        : szPrinterId_(szPrinterId), szName_(szCupsPrinterName) {}
    bool Begin(const FILE *pPipe) override {
        iAnswer_ = 0;
        return XARG_OK(pPipe != nullptr, "((void *)0) != pPipe") &&
               XARG_OK(szPrinterId_ != nullptr, "((void *)0) != szPrinterId") &&
               XARG_OK(szName_ != nullptr, "NULL != szCupsPrinterName");
    }
    bool Line(const char *szLine) override {
        if (std::strstr(szLine, szName_) == nullptr) return false;
        iAnswer_ = std::strstr(szLine, szPrinterId_) != nullptr ? 1 : 2;
        return true;
    }
    int32_t answer() const { return iAnswer_; }

private:
    const char *szPrinterId_;
    const char *szName_;
    int32_t iAnswer_ = 0;
};
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
        NameRule rule(szPrinterId, szCupsPrinterName);
        if (!xavo::ReadQueueList(rule)) {
            XSETERR(ERR_EXEC);
            return -1;
        }
        return rule.answer();
    });
}
