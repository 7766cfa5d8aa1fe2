#include <syslog.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_printer_rm";
constexpr char kLogNoName[] = "%s:%d cannot find cups printer name, printer=%s";
constexpr int kNameSize = 128;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsRm(const char *szPrinterId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szPrinterId[0] == '\0') {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szName[kNameSize] = {};
        if (XAVOPrinterCupsNameGet(szPrinterId, szName, sizeof szName) != 0) {
            XLOG(LOG_ERR, kLogNoName, szPrinterId);
            return -1;
        }
        // Only a queue that CUPS holds for this printer's own device goes:
        // a stored name may since have been given to another printer.
        if (XAVOPrinterCupsNameCheck(szPrinterId, szName) != 1) {
            XLOG(LOG_ERR, kLogNoName, szPrinterId);
            return -1;
        }
        return XAVOPrinterCupsRmByName(szName);
    });
}
