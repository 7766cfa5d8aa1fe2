#include <syslog.h>

#include <cerrno>
#include <optional>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "internal/tool_lines.h"
#include "net/ping_lines.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_ping_status";
constexpr char kPingPath[] = "/bin/ping";
// One second whatever comes back: the caller's page waits on this.
constexpr char kPingDeadline[] = "1";
constexpr char kStatusOffline[] = "Offline";
constexpr char kStatusOnline[] = "Online";
constexpr int kLineBuffer = 1024;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetPingStatus(const char *szIP, char *szStatus, int32_t cbStatus) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(szStatus != nullptr, "((void *)0) != szStatus") ||
            !XARG_OK(0 < cbStatus, "0 < cbStatus")) {
            return -1;
        }
        const int iCallerErrno = errno;
        std::optional<xavo::ErrnoKeeper> keepErrno;  // outlives the pipe's close
        xavo::Pipe ping(ORLICPopen(kPingPath, "r", "-w", kPingDeadline, szIP, nullptr));
        if (!ping) {
            XSETERR(ERR_OPEN);
            errno = 0;
            return -1;
        }
        xavo::CopyText(szStatus, cbStatus, kStatusOffline);
        // Starting the tool may have changed errno: what is kept is the
        // caller's own value.
        errno = iCallerErrno;
        keepErrno.emplace();

        char szLine[kLineBuffer] = {};
        std::optional<bool> reachable;
        xavo::ToolRead end =
            xavo::ReadToolLines(ping.get(), szLine, sizeof szLine, xavo::kToolMaxInterruptedReads,
                                [&](char *szTrimmed) {
                                    reachable = xavo::PingSummaryReachable(szTrimmed);
                                    return !reachable.has_value();
                                });
        if (end == xavo::ToolRead::kInterrupted) return -1;
        if (reachable.value_or(false)) xavo::CopyText(szStatus, cbStatus, kStatusOnline);
        return 0;
    });
}
