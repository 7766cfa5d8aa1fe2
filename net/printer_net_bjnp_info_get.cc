#include <syslog.h>
#include <unistd.h>

#include <cstdio>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "internal/tool_lines.h"
#include "net/bjnp_lines.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_bjnp_info_get";
constexpr char kLogSetInfoFailed[] = "%s:%d Failed to set network printer BJNP info: %s[0x%04X %s:%d]";
constexpr char kBjnpBackendPath[] = "/usr/lib/cups/backend/bjnp";
constexpr char kBackendBjnp[] = "bjnp";
constexpr int kAttempts = 3;
// The backend's discovery may still be settling (a printer answering
// without its identity yet): give it a second before listing again.
constexpr unsigned kRetryWaitSeconds = 1;
constexpr int kLineBuffer = 1024;
constexpr int32_t kFieldSize = 1024;
// An interrupted read spoils this listing; the whole listing is retried
// instead of the read.
constexpr int kNoInterruptedReads = 0;

// Reads one listing for the device at szIpPattern: 0 filled, 1 not listed,
// -1 failed (the caller lists again).
int32_t NetBjnpInfoParse(FILE *pPipe, const char *szIpPattern, NetPrinterInfo *pNPInfo) {
    if (!XARG_OK(pPipe != nullptr, "((void *)0) != pPipe") ||
        !XARG_OK(szIpPattern != nullptr, "((void *)0) != szIpPattern") ||
        !XARG_OK(pNPInfo != nullptr, "NULL != pNPInfo")) {
        return -1;
    }
    xavo::ErrnoKeeper keepErrno;
    char szLine[kLineBuffer] = {};
    xavo::BjnpLine found;
    xavo::ToolRead end =
        xavo::ReadToolLines(pPipe, szLine, sizeof szLine, kNoInterruptedReads, [&](char *szTrimmed) {
            found = xavo::BjnpClassifyLine(szTrimmed, szIpPattern);
            return found.kind == xavo::BjnpLineKind::kOther;
        });
    if (end == xavo::ToolRead::kInterrupted) return -1;
    if (end == xavo::ToolRead::kEnd || found.kind == xavo::BjnpLineKind::kUnknown) return 1;
    if (found.kind == xavo::BjnpLineKind::kUnidentified) return -1;

    // The matched line, still whole in szLine, for the log.
    if (!found.bHasManufacturer) {
        XSETERR(ERR_NOT_FOUND);
        XLOG(LOG_ERR, kLogSetInfoFailed, szLine, XERR_TAIL);
        return -1;
    }
    xavo::CopyText(pNPInfo->szStringId, found.stringId);
    if (XAVOPrinterConfStringIdGetVendor(pNPInfo->szStringId, pNPInfo->szBrand, kFieldSize) < 0 ||
        XAVOPrinterConfStringIdGetModel(pNPInfo->szStringId, pNPInfo->szModel, kFieldSize) < 0) {
        XLOG(LOG_ERR, kLogSetInfoFailed, szLine, XERR_TAIL);
        return -1;
    }
    xavo::CopyText(pNPInfo->szBackend, kBackendBjnp);
    return 0;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetBjnpInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(pNPInfo != nullptr, "NULL != pNPInfo")) {
            return -1;
        }
        // Like the other network readers, the caller's errno is kept, the
        // backend's close included.
        xavo::ErrnoKeeper keepErrno;
        char szPatternBuf[32];
        xavo::BjnpIpPattern(szIP, szPatternBuf);

        for (int iAttempt = 0; iAttempt < kAttempts; ++iAttempt) {
            xavo::Pipe listing(ORLICPopen(kBjnpBackendPath, "r", nullptr));
            // A backend that cannot start will not start a second later
            // either, and nothing was asked of the network: no wait.
            if (!listing) continue;
            int32_t iParse = NetBjnpInfoParse(listing.get(), szPatternBuf, pNPInfo);
            int iClose = listing.Close();
            if ((iParse == 0 || iParse == 1) && iClose >= 0) return iParse;
            sleep(kRetryWaitSeconds);
        }
        XSETERR(ERR_EXEC);
        return -1;
    });
}
