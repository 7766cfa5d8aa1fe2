// Tells whether the Samba printer share is set up.
#include <syslog.h>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "share/smb_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_is_active";
constexpr char kLogTooFewEntries[] = "%s:%d Section [Printers] should contain at least %d entries.[%d]";
constexpr int32_t kHashCapacity = 512;
// The share counts as set up from eight entries on, one more than the seven
// keys that the library itself writes.
constexpr int32_t kMinEntries = 8;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterIsActive(void) noexcept {
    return XAVO_BOUNDARY(0, [] {
        xavo::SzHash hash(ORLICSzHashAlloc(kHashCapacity));
        if (!hash) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return 0;
        }
        const int32_t iEntries = ORLICFileGetSection(xavo::kSmbReservedConfPath, xavo::kSmbPrintersSection,
                                                     hash.addr());
        if (iEntries <= 0) return 0;
        if (iEntries < kMinEntries) {
            XLOG(LOG_ERR, kLogTooFewEntries, kMinEntries, iEntries);
            return 0;
        }
        return 1;
    });
}
