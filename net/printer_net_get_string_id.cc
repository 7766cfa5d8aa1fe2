#include <syslog.h>

#include <cstring>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/tool_lines.h"
#include "net/snmp_lines.h"
#include "net/snmp_walk.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_get_string_id";
constexpr char kLogOpenFailed[] = "%s:%d open failed. [0x%04X %s:%d]";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetGetStringId(const char *szIP, char *szOutBuf, int32_t iOutSize) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(szOutBuf != nullptr, "((void *)0) != szOutBuf") ||
            !XARG_OK(0 < iOutSize, "0 < iOutSize")) {
            return -1;
        }
        // Declared before the pipe so that errno is put back after the
        // pipe's close, which may change it.
        xavo::ErrnoKeeper keepErrno;
        std::memset(szOutBuf, 0, static_cast<size_t>(iOutSize));

        xavo::Pipe walk(xavo::StartSnmpWalk(szIP));
        if (!walk) {
            XLOG(LOG_ERR, kLogOpenFailed, XERR_TAIL);
            return -1;
        }

        char szLine[xavo::kSnmpLineBuffer] = {};
        bool bSawLine = false;
        int32_t iResult = -1;
        xavo::ToolRead end = xavo::ReadToolLines(
            walk.get(), szLine, sizeof szLine, xavo::kToolMaxInterruptedReads, [&](char *szTrimmed) {
                bSawLine = true;
                xavo::SnmpDeviceId id = xavo::SnmpDeviceIdFromLine(szTrimmed);
                if (id.kind == xavo::SnmpIdKind::kNone) return true;
                if (id.kind == xavo::SnmpIdKind::kCutShort ||
                    id.value.size() >= static_cast<size_t>(iOutSize)) {
                    XSETERR(ERR_BAD_DATA);
                    iResult = -1;
                    return false;
                }
                std::memcpy(szOutBuf, id.value.data(), id.value.size());
                iResult = 0;
                return false;
            });
        if (end == xavo::ToolRead::kStopped) return iResult;
        if (end == xavo::ToolRead::kInterrupted) return -1;
        // A printer that does not answer makes the tool print nothing at
        // all; lines without a device ID mean it answered with none.
        return bSawLine ? -1 : 1;
    });
}
