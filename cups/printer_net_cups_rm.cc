#include <syslog.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_cups_rm";
constexpr char kLogNoName[] = "%s:%d cannot find cups printer name, printer=%s[0x%04X %s:%d]";
constexpr int kNameSize = 128;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetCupsRm(const char *szPrinterId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szPrinterId != nullptr, "((void *)0) != szPrinterId") ||
            !XARG_OK(szPrinterId[0] != '\0', "0 != szPrinterId[0]")) {
            return -1;
        }
        char szName[kNameSize] = {};
        if (XAVOPrinterCupsNameGet(szPrinterId, szName, sizeof szName) != 0) {
            XLOG(LOG_ERR, kLogNoName, szPrinterId, XERR_TAIL);
            return -1;
        }
        // A network queue's name is the caller's own choice, stored with
        // the printer: no device check, the name is the printer's.
        return XAVOPrinterCupsRmByName(szName);
    });
}
