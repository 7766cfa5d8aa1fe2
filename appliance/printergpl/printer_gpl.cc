// The appliance's printer helper library: the stored device ID string of a
// printer.
#include "common/appliance.h"
#include "xavoprintergpl.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "printer_gpl";
constexpr char kPrinterConf[] = "/usr/xavo/etc/printer.conf";
constexpr char kStringIdKey[] = "usblp string id";
}  // namespace

// 0 when the printer's section holds the key (its value, cut to fit, is in
// szBuf); -1 otherwise, with the last error the section read set.
XAVO_PLATFORM_API int32_t XAVOPrinterGPLConfStringIdGet(const char *szPrinterId, char *szBuf, int32_t cbBuf) {
    if (XAVO_INJECTED()) return -1;
    if (szPrinterId == nullptr || szBuf == nullptr || cbBuf <= 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    szBuf[0] = '\0';
    return ORLICFileGetSectionValue(kPrinterConf, szPrinterId, kStringIdKey, szBuf, cbBuf) < 0 ? -1 : 0;
}
