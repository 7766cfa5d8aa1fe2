#include <syslog.h>
#include <unistd.h>

#include "internal/boundary.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_conf_unlock";
}

XAVO_EXPORT int32_t XAVOPrinterPrinterConfUnlock(int32_t fdLock) noexcept {
    return XAVO_BOUNDARY(0, [&] {
        if (!XARG_OK(0 <= fdLock, "0 <= fdLock")) return 0;
        return close(fdLock) == 0 ? 1 : 0;
    });
}
