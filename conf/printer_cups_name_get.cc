#include <syslog.h>

#include "conf/conf_paths.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_name_get";
constexpr char kLogNameGetFailed[] = "%s:%d get cups printer name failed, printer=%s";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsNameGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szBuf == nullptr || cbBuf <= 0 || szPrinterId == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        // Readers take no lock: every writer replaces the file atomically,
        // so a read sees the file before or after a write, never half of it.
        int32_t iRead = ORLICFileGetSectionValue(xavo::kPrinterConfPath, szPrinterId,
                                                 xavo::kKeyCupsPrinterName, szBuf, cbBuf);
        // Callers rely on it: 0 always comes with a name, never an empty one.
        if (iRead >= 0 && szBuf[0] != '\0') return 0;
        XLOG(LOG_ERR, kLogNameGetFailed, szPrinterId);
        return -1;
    });
}
