// Cancels every CUPS job and empties the printer spool directory.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_clean_spool";
constexpr char kLogLprmFailed[] = "%s:%d lprm all failed. [0x%04X %s:%d]";
constexpr char kLogRemoveFailed[] = "%s:%d remove %s failed. [0x%04X %s:%d]";

constexpr char kLprm[] = "/usr/bin/lprm";
constexpr char kRm[] = "/bin/rm";
constexpr char kSpoolDir[] = "/var/services/printer";
// Every entry of the spool whose name holds a dot.  The platform's runner
// expands an absolute pattern itself, without a shell, and hands each match
// to rm as one argument: spool files are named by whoever prints over
// Samba, and no character of such a name may be interpreted.  The fixed
// pattern is also what stays safe on a runner that does use a shell, where
// a list of names built here would not be.
constexpr char kSpoolPattern[] = "/var/services/printer/*.*";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCleanSpool(void) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        // Jobs that cannot be cancelled (none queued, or no scheduler) do
        // not keep the spool from being emptied.
        if (ORLICExec(kLprm, "all", nullptr, nullptr, nullptr) != 0) XLOG(LOG_ERR, kLogLprmFailed, XERR_TAIL);

        if (ORLICExec(kRm, "-rf", kSpoolPattern, nullptr, nullptr) == 0) return 0;
        XLOG(LOG_ERR, kLogRemoveFailed, kSpoolDir, XERR_TAIL);
        return -1;
    });
}
