#include <syslog.h>

#include "cups/queue_create.h"
#include "internal/log.h"
#include "internal/name_path.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_backup_ppd";
constexpr char kLogMkdirFailed[] = "%s:%d mkdir -p %s failed";
constexpr char kLogCopyFailed[] = "%s:%d cp -f %s %s failed";
constexpr char kMkdirPath[] = "/bin/mkdir";
constexpr char kCpPath[] = "/bin/cp";
constexpr int kDestSize = 256;
constexpr char kCondKeptName[] = "((void *)0) == strpbrk(szPrinterId, \"/*?[\")";
constexpr char kCondDestFits[] =
    "sizeof(szDest) > snprintf(szDest, sizeof(szDest), \"/etc/cups/ppd/%s.ppd\", szPrinterId)";
}  // namespace

namespace xavo {

bool KeptPpdName(const char *szPrinterId) {
    return IsBaseName(szPrinterId) && !HoldsFilePattern(szPrinterId);
}

int32_t PrinterBackupPpd(const char *szPpdFile, const char *szPrinterId) {
    if (!XARG_OK(szPpdFile != nullptr, "((void *)0) != szPpdFile") ||
        !XARG_OK(szPpdFile[0] != '\0', "0 != szPpdFile[0]") ||
        !XARG_OK(szPrinterId != nullptr, "((void *)0) != szPrinterId") ||
        !XARG_OK(szPrinterId[0] != '\0', "0 != szPrinterId[0]")) {
        return -1;
    }
    // Refused before anything runs.  The destination's buffer holds 256
    // bytes; a printer ID too long for it is refused rather than cut, since
    // a cut ID is another printer's ID and its copy would be overwritten.
    char szDest[kDestSize] = {};
    if (!XARG_OK(KeptPpdName(szPrinterId), kCondKeptName) ||
        !XARG_OK(NamePath(szDest, kKeptPpd, szPrinterId), kCondDestFits)) {
        return -1;
    }
    if (ORLICExec(kMkdirPath, "-p", kPpdDir, nullptr, nullptr) != 0) {
        XLOG(LOG_ERR, kLogMkdirFailed, kPpdDir);
        XSETERR(ERR_EXEC);
        return -1;
    }
    if (ORLICExec(kCpPath, "-f", szPpdFile, szDest, nullptr) != 0) {
        XLOG(LOG_ERR, kLogCopyFailed, szPpdFile, szDest);
        XSETERR(ERR_EXEC);
        return -1;
    }
    return 0;
}

}  // namespace xavo
