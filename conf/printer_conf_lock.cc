// The printer lock: serialises every process that writes the printer
// configuration file.
#include <unistd.h>

#include "internal/boundary.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_conf_lock";
constexpr char kLockPath[] = "/run/xavosdk/lock/lock_printer";
constexpr int kLockAttempts = 100;
constexpr useconds_t kLockPauseUs = 50000;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterPrinterConfLock(void) noexcept {
    return XAVO_BOUNDARY(-1, [] {
        for (int attempt = 0; attempt < kLockAttempts; ++attempt) {
            int32_t fdLock = -1;
            if (ORLICFileLockByFile(kLockPath, 1, &fdLock) == 1) return fdLock;
            // The pause follows the last failed attempt too: a writer that
            // gives up has waited the full five seconds.
            usleep(kLockPauseUs);
        }
        return int32_t{-1};
    });
}
