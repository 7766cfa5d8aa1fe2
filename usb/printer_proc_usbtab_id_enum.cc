// Appends the printer IDs that the USB library gives the printers of the
// USB printer table.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "usb/usb_paths.h"
#include "usb/usb_printer_id.h"
#include "xavoprinter.h"
#include "xavousb.h"

namespace {
constexpr char kUnit[] = "printer_proc_usbtab_id_enum";
constexpr char kLogEnumFailed[] = "%s:%d Enum printer from usbtab failed";
constexpr char kLogInfoFailed[] = "%s:%d get printer info failed, printer=%s";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterProcUsbtabIdEnum(ORLICSzList **ppList) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (ppList == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char **ppszNames = nullptr;
        int32_t iCount = 0;
        if (XAVOPrinterUsbtabEnum(&ppszNames, &iCount) != 0) {
            XLOG(LOG_ERR, kLogEnumFailed);
            return -1;
        }
        xavo::HeapText names(reinterpret_cast<char *>(ppszNames));
        for (int32_t i = 0; i < iCount; ++i) {
            XAVOUSBDevInfo info{};
            if (XAVOUSBDevGetInfo(ppszNames[i], &info) < 0) {
                XLOG(LOG_ERR, kLogInfoFailed, ppszNames[i]);
                continue;
            }
            // Only the USB library's own printer ID is listed (the vendor,
            // product and serial form belongs to the enable flow), formed
            // as the enable names the printer's section: a caller that
            // creates a queue with a listed ID finds the section.
            char szPrinterId[xavo::kUsbPrinterIdSize] = {};
            if ((info.uKind & xavo::kUsbPrinterKinds) != 0 && xavo::UsbLibraryPrinterId(info, szPrinterId)) {
                ORLICSzListPush(ppList, szPrinterId);
            }
        }
        return 0;
    });
}
