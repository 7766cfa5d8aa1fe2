// Tells whether a job is still listed in a printer's CUPS queue.
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <string>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/line_reader.h"
#include "internal/log.h"
#include "print/lpq_lines.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_job_wait_complete";
constexpr char kLogNoCupsName[] = "%s:%d get cups printer name failed, printer=%s";
constexpr char kLogNotRunning[] = "%s:%d %s is not running.";
constexpr char kLogOpenFailed[] = "%s:%d open failed. [0x%04X %s:%d]";
constexpr char kLogJobListed[] = "%s:%d CheckJobIdInQueue failed. (%m)";
constexpr char kLogUnreadable[] = "%s:%d queue of %s unreadable after %d listings";

constexpr char kLpq[] = "/usr/bin/lpq";
constexpr char kCupsd[] = "cupsd";
constexpr int32_t kCupsNameSize = 32;

// A listing cut short by a read error or a failed close is taken again,
// but not forever: three listings one second apart, as the queue creation
// reads lpstat.  A scheduler that is restarting answers again well within
// that; one that keeps failing would otherwise hold the print service's
// thread in this call for good, while the caller polls the job anyway and
// can simply ask again.
constexpr int kListingAttempts = 3;
constexpr unsigned kRelistDelaySeconds = 1;

enum class Listing { kJobListed, kJobGone, kUnreadable };

// One complete listing of the queue; kUnreadable when it could not be read
// to its end or lpq could not be closed cleanly.
Listing ListQueue(xavo::Pipe &pipe, const char *szJobId) {
    bool bReachedEnd = false;
    {
        // The caller's errno comes back before anything is logged, so that
        // the job line's "%m" shows errno as it stood when lpq was started.
        xavo::ErrnoKeeper keepErrno;
        std::string line;
        for (;;) {
            xavo::ReadStatus st = xavo::ReadLine(pipe.get(), line);
            if (st == xavo::ReadStatus::kLine) {
                if (xavo::LpqLineListsJob(line, szJobId)) return Listing::kJobListed;
                continue;
            }
            bReachedEnd = st == xavo::ReadStatus::kEnd && !std::ferror(pipe.get());
            break;
        }
    }
    int32_t iClose = pipe.Close();
    return (iClose >= 0 && bReachedEnd) ? Listing::kJobGone : Listing::kUnreadable;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsJobWaitComplete(const char *szPrinterId, const char *szJobId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr || szJobId == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szCupsName[kCupsNameSize] = {};
        if (XAVOPrinterCupsNameGet(szPrinterId, szCupsName, kCupsNameSize) != 0) {
            XLOG(LOG_ERR, kLogNoCupsName, szPrinterId);
            return -1;
        }
        if (ORLIServiceIsRunning(kCupsd) == 0) {
            XLOG(LOG_ERR, kLogNotRunning, kCupsd);
            return -1;
        }

        for (int iAttempt = 1;; ++iAttempt) {
            xavo::Pipe pipe(ORLICPopen(kLpq, "r", "-P", szCupsName, nullptr));
            if (!pipe) {
                XLOG(LOG_ERR, kLogOpenFailed, XERR_TAIL);
                return -1;
            }
            switch (ListQueue(pipe, szJobId)) {
                case Listing::kJobListed:
                    XLOG(LOG_ERR, kLogJobListed);
                    return 1;
                case Listing::kJobGone:
                    return 0;
                case Listing::kUnreadable:
                    break;
            }
            if (iAttempt >= kListingAttempts) {
                XSETERR(ERR_EXEC);
                XLOG(LOG_ERR, kLogUnreadable, szCupsName, kListingAttempts);
                return -1;
            }
            sleep(kRelistDelaySeconds);
        }
    });
}
