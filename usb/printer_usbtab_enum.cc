// Lists the usblp device names of the USB printer table, through the USB
// library which reads the table.
#include <syslog.h>

#include <cstdlib>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "usb/usb_paths.h"
#include "xavoprinter.h"
#include "xavousb.h"

namespace {
constexpr char kUnit[] = "printer_usbtab_enum";
constexpr char kLogEnumFailed[] = "%s:%d Failed to enum USB device from usbtab.";
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterUsbtabEnum(char ***pppszDevNames, int32_t *piCount) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (pppszDevNames == nullptr || piCount == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        // The caller's earlier array goes whatever happens below.
        xavo::HeapText earlier(reinterpret_cast<char *>(*pppszDevNames));
        *pppszDevNames = nullptr;

        int32_t cbNeeded = 0;
        if (XAVOUSBDevEnum(xavo::kUsbPrinterKinds, nullptr, 0, &cbNeeded) >= 0 && cbNeeded >= 0) {
            earlier.reset();
            // One byte at least: an empty table still hands back a block
            // that the caller frees like any other.
            xavo::HeapText block(static_cast<char *>(std::calloc(1, cbNeeded > 0 ? cbNeeded : 1)));
            if (!block) {
                XSETERR(ERR_OUT_OF_MEMORY);
                *piCount = 0;
                return -1;
            }
            const int32_t iCount = XAVOUSBDevEnum(xavo::kUsbPrinterKinds, block.get(), cbNeeded, &cbNeeded);
            if (iCount >= 0) {
                *piCount = iCount;
                *pppszDevNames = reinterpret_cast<char **>(block.release());
                return 0;
            }
        }
        XLOG(LOG_ERR, kLogEnumFailed);
        // The pointer is null now; a count that says otherwise would send a
        // caller walking an array that is not there.
        *piCount = 0;
        return -1;
    });
}
