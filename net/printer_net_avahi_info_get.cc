#include <syslog.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <optional>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "internal/tool_lines.h"
#include "net/avahi_lines.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_avahi_info_get";
constexpr char kLogOpenFailed[] = "%s:%d open failed. [0x%04X %s:%d]";
constexpr char kLogStrTokFailed[] = "%s:%d Failed to ORLICStrTok[0x%04X %s:%d]";
constexpr char kLogNoStringId[] = "%s:%d Failed to make printer string ID. Info: %s";
// Indexed by xavo::AvahiService, in the order of preference.
constexpr const char *kLogSetInfoFailed[xavo::kAvahiServiceCount] = {
    "%s:%d Failed to set network printer BJNP info: %s[0x%04X %s:%d]",
    "%s:%d Failed to set network printer Socket info: %s[0x%04X %s:%d]",
    "%s:%d Failed to set network printer LPD info: %s[0x%04X %s:%d]",
    "%s:%d Failed to set network printer IPP info: %s[0x%04X %s:%d]",
};
constexpr char kStringIdFormat[] = "MFG:%s;CMD:%s;MDL:%s;CLS:PRINTER;DES:%s %s;";
constexpr char kNotFound[] = "Not Found";
constexpr char kKeyModel[] = "usb_MDL=";
constexpr char kKeyBrand[] = "usb_MFG=";
constexpr char kKeyCommandSet[] = "usb_CMD=";
constexpr char kAvahiDaemon[] = "avahi-daemon";
constexpr char kAvahiService[] = "avahi";
constexpr char kAvahiBrowsePath[] = "/usr/xavo/sbin/avahi-browse";
// All service types, resolved, parsable, ending once the cache is dumped.
constexpr char kAvahiBrowseArgs[] = "-arpt";
constexpr char kFieldSeparator[] = ";";
constexpr int32_t kFieldListCapacity = 1024;
constexpr int kTextBuffer = 1024;

template <size_t N>
void CopyTxtValue(std::string_view txt, std::string_view key, char (&dst)[N]) {
    if (std::optional<std::string_view> value = xavo::AvahiTxtValue(txt, key)) xavo::CopyText(dst, *value);
}

// Completes the record from a service's TXT record: make, model and, when
// the record holds none yet, a device ID string built from them.
int32_t NetAvahiTxtParse(const char *szDesc, NetPrinterInfo *pNPInfo) {
    if (!XARG_OK(szDesc != nullptr, "((void *)0) != szDesc") ||
        !XARG_OK(pNPInfo != nullptr, "NULL != pNPInfo")) {
        return -1;
    }
    char szCommandSet[kTextBuffer] = {};
    CopyTxtValue(szDesc, kKeyModel, pNPInfo->szModel);
    CopyTxtValue(szDesc, kKeyBrand, pNPInfo->szBrand);
    CopyTxtValue(szDesc, kKeyCommandSet, szCommandSet);

    // A device ID the printer gave itself (by SNMP) is better than one
    // pieced together from its announcement.
    if (xavo::FieldText(pNPInfo->szStringId).size() > 0) return 0;

    if (xavo::FieldText(pNPInfo->szBrand).empty() || xavo::FieldText(pNPInfo->szModel).empty()) {
        xavo::CopyText(pNPInfo->szBrand, kNotFound);
        xavo::CopyText(pNPInfo->szModel, kNotFound);
        XLOG(LOG_ERR, kLogNoStringId, szDesc);
    }
    // Longer text is cut to the field: the make and model it begins with
    // are what the appliance reads back.
    int iWritten = std::snprintf(pNPInfo->szStringId, sizeof pNPInfo->szStringId, kStringIdFormat,
                                 pNPInfo->szBrand, szCommandSet, pNPInfo->szModel, pNPInfo->szBrand,
                                 pNPInfo->szModel);
    (void)iWritten;
    return 0;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetAvahiInfoGet(const char *szIP, NetPrinterInfo *pNPInfo) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(pNPInfo != nullptr, "NULL != pNPInfo")) {
            return -1;
        }
        const int iCallerErrno = errno;
        // The daemon is started on demand; a browse without it simply finds
        // nothing, which the result then says.
        if (ORLICIsProcAlive(kAvahiDaemon) <= 0) ORLIServiceStart(kAvahiService, 0);

        xavo::SzList fields(ORLICSzListAlloc(kFieldListCapacity));
        if (!fields) {
            XSETERR(ERR_OUT_OF_MEMORY);
            errno = 0;
            return -1;
        }
        char szPattern[kTextBuffer] = {};
        std::snprintf(szPattern, sizeof szPattern, ";%s;", szIP);

        std::optional<xavo::ErrnoKeeper> keepErrno;  // outlives the pipe's close
        xavo::Pipe browse(ORLICPopen(kAvahiBrowsePath, "r", kAvahiBrowseArgs, nullptr));
        if (!browse) {
            XLOG(LOG_ERR, kLogOpenFailed, XERR_TAIL);
            errno = 0;
            return -1;
        }
        // Starting the tool may have changed errno: what is kept is the
        // caller's own value.
        errno = iCallerErrno;
        keepErrno.emplace();

        // The last TXT record seen for the address on each known port.
        char aszTxt[xavo::kAvahiServiceCount][kTextBuffer] = {};
        char szLine[kTextBuffer] = {};
        bool bSplitFailed = false;
        xavo::ToolRead end = xavo::ReadToolLines(
            browse.get(), szLine, sizeof szLine, xavo::kToolMaxInterruptedReads, [&](char *szTrimmed) {
                if (std::strstr(szTrimmed, szPattern) == nullptr) return true;
                int iFirst = xavo::ListCount(fields.get());
                if (ORLICStrTok(szTrimmed, kFieldSeparator, fields.addr()) < 0) {
                    XLOG(LOG_ERR, kLogStrTokFailed, XERR_TAIL);
                    bSplitFailed = true;
                    return false;
                }
                // This line's fields, whether the split replaced the list's
                // items or added to them.
                int iCount = xavo::ListCount(fields.get());
                if (iFirst >= iCount) iFirst = 0;
                if (iCount - iFirst < 2) return true;
                std::optional<xavo::AvahiService> service =
                    xavo::AvahiServiceForPort(xavo::ListItem(fields.get(), iCount - 2));
                if (service) xavo::CopyText(aszTxt[*service], xavo::ListItem(fields.get(), iCount - 1));
                return true;
            });
        if (bSplitFailed || end == xavo::ToolRead::kInterrupted) return -1;

        // Chosen only now, whatever order the services were printed in.
        for (int i = 0; i < xavo::kAvahiServiceCount; ++i) {
            if (aszTxt[i][0] == '\0') continue;
            xavo::CopyText(pNPInfo->szBackend, xavo::AvahiBackendName(static_cast<xavo::AvahiService>(i)));
            if (NetAvahiTxtParse(aszTxt[i], pNPInfo) < 0) {
                XLOG(LOG_ERR, kLogSetInfoFailed[i], aszTxt[i], XERR_TAIL);
                return -1;
            }
            return 0;
        }
        return 1;
    });
}
