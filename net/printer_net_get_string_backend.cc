#include <syslog.h>

#include <cerrno>
#include <optional>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "internal/tool_lines.h"
#include "net/snmp_lines.h"
#include "net/snmp_walk.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_get_string_backend";
constexpr char kLogOpenFailed[] = "%s:%d open failed. [0x%04X %s:%d]";
constexpr char kLogFetchFailed[] = "%s:%d Fetch network printer protocol and queue name error.[0x%04X %s:%d]";
constexpr char kLogListAllocFailed[] = "%s:%d Failed to ORLICSzListAlloc[0x%04X %s:%d]";
constexpr char kLogStrTokFailed[] = "%s:%d Failed to ORLICStrTok[0x%04X %s:%d]";
constexpr char kBackendLpd[] = "lpd";
constexpr int32_t kPieceListCapacity = 1024;
constexpr int kUriBuffer = 1024;

// Fills the backend and queue from an accepted printer URI; 0 or -1.
int32_t FillFromUri(std::string_view uri, char *szBackend, uint32_t cbBackend, char *szQName, uint32_t cbQName) {
    char szUri[kUriBuffer] = {};
    xavo::CopyText(szUri, uri);
    xavo::SnmpUriParts parts = xavo::SnmpSplitUri(szUri);

    if (parts.backend == xavo::SnmpBackend::kUnmapped) {
        XLOG(LOG_ERR, kLogFetchFailed, XERR_TAIL);
        return -1;
    }
    if (parts.backend == xavo::SnmpBackend::kLpd) {
        xavo::CopyText(szBackend, cbBackend, kBackendLpd);
    } else {
        // The scheme ends at the colon; cut it there for the platform's
        // lower-casing, which reads a NUL-terminated text.
        szUri[parts.scheme.size()] = '\0';
        ORLICStrCaseLower(szUri, 0, szBackend, static_cast<int32_t>(cbBackend));
    }

    xavo::SzList pieces(ORLICSzListAlloc(kPieceListCapacity));
    if (!pieces) {
        XLOG(LOG_ERR, kLogListAllocFailed, XERR_TAIL);
        XSETERR(ERR_OUT_OF_MEMORY);
        XLOG(LOG_ERR, kLogFetchFailed, XERR_TAIL);
        return -1;
    }
    // parts.rest points into szUri behind the scheme's cut, still
    // NUL-terminated at the URI's end.
    if (ORLICStrTok(parts.rest.data(), "/", pieces.addr()) < 0) {
        XLOG(LOG_ERR, kLogStrTokFailed, XERR_TAIL);
        pieces.reset();
        XLOG(LOG_ERR, kLogFetchFailed, XERR_TAIL);
        return -1;
    }
    // Pieces: the host (with its port, if any), then the path; the queue is
    // the first path segment.
    const char *szQueue = xavo::ListCount(pieces.get()) < 2 ? "" : xavo::ListItem(pieces.get(), 1);
    xavo::CopyText(szQName, cbQName, szQueue);
    return 0;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetGetStringBackend(const char *szIP, char *szBackend, uint32_t cbBackend,
                                                   char *szQName, uint32_t cbQName) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(szBackend != nullptr, "((void *)0) != szBackend") ||
            !XARG_OK(szQName != nullptr, "NULL != szQName")) {
            return -1;
        }
        // The caller's errno is kept once the tool runs; it outlives the
        // pipe so that the close cannot change it either.
        const int iCallerErrno = errno;
        std::optional<xavo::ErrnoKeeper> keepErrno;
        xavo::Pipe walk(xavo::StartSnmpWalk(szIP));
        if (!walk) {
            XLOG(LOG_ERR, kLogOpenFailed, XERR_TAIL);
            errno = 0;
            return -1;
        }
        // Starting the tool may have changed errno: what is kept is the
        // caller's own value.
        errno = iCallerErrno;
        keepErrno.emplace();

        char szLine[xavo::kSnmpLineBuffer] = {};
        xavo::SnmpUri uri;
        xavo::ToolRead end = xavo::ReadToolLines(
            walk.get(), szLine, sizeof szLine, xavo::kToolMaxInterruptedReads, [&](char *szTrimmed) {
                uri = xavo::SnmpUriFromLine(szTrimmed);
                return uri.kind == xavo::SnmpUriKind::kPass;
            });
        if (end == xavo::ToolRead::kEnd) return 1;
        if (end == xavo::ToolRead::kInterrupted || uri.kind == xavo::SnmpUriKind::kBad) return -1;
        // uri.text points into szLine, which stays as it is from here on.
        return FillFromUri(uri.text, szBackend, cbBackend, szQName, cbQName);
    });
}
