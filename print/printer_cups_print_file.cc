// Submits a file to a printer's CUPS queue with lpr.
#include <syslog.h>


#include "internal/argv.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_print_file";
constexpr char kLogNoCupsName[] = "%s:%d cannot get cups printer name, printer=%s";
constexpr char kLogExecFailed[] = "%s:%d execv error, cmd=%s, ret=%d";

constexpr char kLpr[] = "/usr/bin/lpr";
// lpr, -P, name, -r, -T, title, file and the terminating null.
constexpr size_t kLprSlots = 8;
constexpr int32_t kCupsNameSize = 32;

// The vector in the order lpr is given its options; false when a copy
// cannot be allocated.
bool BuildLprArgs(xavo::ArgVector &argv, const char *szCupsName, const char *szFile, const char *szTitle,
                  int32_t blRemove) {
    if (!argv.Push(kLpr) || !argv.Push("-P") || !argv.Push(szCupsName)) return false;
    // Only exactly 1 asks for removal: callers pass other non-zero values
    // meaning "keep", and removing a caller's file by mistake cannot be
    // undone.
    if (blRemove == 1 && !argv.Push("-r")) return false;
    if (szTitle != nullptr && szTitle[0] != '\0' && (!argv.Push("-T") || !argv.Push(szTitle))) return false;
    return argv.Push(szFile);
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsPrintFile(const char *szPrinterId, const char *szFile, const char *szTitle,
                                             int32_t blRemove) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szFile == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szCupsName[kCupsNameSize] = {};
        if (XAVOPrinterCupsNameGet(szPrinterId, szCupsName, kCupsNameSize) != 0) {
            XLOG(LOG_ERR, kLogNoCupsName, szPrinterId);
            return -1;
        }

        xavo::ArgVector argv(kLprSlots - 1);
        if (!BuildLprArgs(argv, szCupsName, szFile, szTitle, blRemove)) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        int32_t iRet = ORLICExecv(kLpr, argv.data(), 1);
        if (iRet != 0) {
            XSETERR(ERR_EXEC);
            XLOG(LOG_ERR, kLogExecFailed, kLpr, iRet);
            return -1;
        }
        return 0;
    });
}
