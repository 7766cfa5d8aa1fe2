// Prints CUPS's shared test page on a printer.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_print_test_page";
constexpr char kLogTestPageFailed[] = "%s:%d cannot print test page, printer id=%s";

// Shared by every printer: submitted without "-r", never removed.
constexpr char kTestPage[] = "/usr/share/cups/data/testprint";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsPrintTestPage(const char *szPrinterId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szPrinterId[0] == '\0') {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        if (XAVOPrinterCupsPrintFile(szPrinterId, kTestPage, nullptr, 0) < 0) {
            XLOG(LOG_ERR, kLogTestPageFailed, szPrinterId);
            return -1;
        }
        return 0;
    });
}
