#include <syslog.h>

#include <cstring>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_info_get_by_ip";
constexpr char kLogBackendFailed[] = "%s:%d Failed to get network printer string Backend.[0x%04X %s:%d]";
constexpr char kLogStringIdFailed[] = "%s:%d Failed to get network printer string ID.[0x%04X %s:%d]";
constexpr char kLogBrandFailed[] = "%s:%d Failed to get network printer brand from string ID.[0x%04X %s:%d]";
constexpr char kLogModelFailed[] = "%s:%d Failed to get network printer model from string ID.[0x%04X %s:%d]";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetInfoGetByIP(const char *szIP, NetPrinterInfo *pNPInfo) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(szIP != nullptr, "((void *)0) != szIP") ||
            !XARG_OK(pNPInfo != nullptr, "NULL != pNPInfo")) {
            return -1;
        }
        std::memset(pNPInfo, 0, sizeof *pNPInfo);

        int32_t iBackend = XAVOPrinterNetGetStringBackend(szIP, pNPInfo->szBackend, sizeof pNPInfo->szBackend,
                                                          pNPInfo->szQName, sizeof pNPInfo->szQName);
        if (iBackend == -1) {
            XLOG(LOG_ERR, kLogBackendFailed, XERR_TAIL);
            return -1;
        }
        // The device ID walk runs whatever the first found: a printer may
        // publish its device ID without any URI, and the caller still wants
        // to know its make and model.
        int32_t iStringId =
            XAVOPrinterNetGetStringId(szIP, pNPInfo->szStringId, static_cast<int32_t>(sizeof pNPInfo->szStringId));
        if (iStringId < 0) {
            XLOG(LOG_ERR, kLogStringIdFailed, XERR_TAIL);
            return -1;
        }
        if (iStringId == 1) return 1;
        if (XAVOPrinterConfStringIdGetVendor(pNPInfo->szStringId, pNPInfo->szBrand, sizeof pNPInfo->szBrand) < 0) {
            XLOG(LOG_ERR, kLogBrandFailed, XERR_TAIL);
            return -1;
        }
        if (XAVOPrinterConfStringIdGetModel(pNPInfo->szStringId, pNPInfo->szModel, sizeof pNPInfo->szModel) < 0) {
            XLOG(LOG_ERR, kLogModelFailed, XERR_TAIL);
            return -1;
        }
        return iBackend == 1 ? 1 : 0;
    });
}
