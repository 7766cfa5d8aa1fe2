// Appends the printer IDs that the USB library gives the printers of the
// USB printer table.
#include <syslog.h>

#include <string>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "usb/usb_paths.h"
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
            // Only the USB library's own printer ID is listed; the vendor,
            // product and serial form belongs to the enable flow.
            const std::string printerId(xavo::FieldText(info.szPrinterId));
            if ((info.uKind & xavo::kUsbPrinterKinds) != 0 && !printerId.empty()) {
                ORLICSzListPush(ppList, printerId.c_str());
            }
        }
        return 0;
    });
}
