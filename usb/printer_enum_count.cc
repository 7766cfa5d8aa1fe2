// Counts, and optionally lists, the printer IDs of the USB and the network
// printers.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_enum_count";
constexpr char kLogUsbFailed[] = "%s:%d enum USB printer id failed[0x%04X %s:%d]";
constexpr char kLogNetFailed[] = "%s:%d enum network printer id failed[0x%04X %s:%d]";
constexpr int32_t kListCapacity = 256;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterEnumCount(int32_t iType, ORLICSzList **ppList) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        xavo::SzList list(ORLICSzListAlloc(kListCapacity));
        if (!list) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        if ((iType & XAVO_PRINTER_TYPE_USB) != 0 && XAVOPrinterProcUsbtabIdEnum(list.addr()) != 0) {
            XLOG(LOG_ERR, kLogUsbFailed, XERR_TAIL);
            return -1;
        }
        if ((iType & XAVO_PRINTER_TYPE_NET) != 0 && XAVOPrinterNetNptabEnum(list.addr()) != 0) {
            XLOG(LOG_ERR, kLogNetFailed, XERR_TAIL);
            return -1;
        }
        const int32_t iCount = xavo::ListCount(list.get());
        if (ppList != nullptr) {
            ORLICSzListFree(*ppList);
            *ppList = list.release();
        }
        return iCount;
    });
}
