// A USB printer comes or goes: the USB printer table (usbtab_update.cc),
// the printer's section of the printer configuration file
// (usb_conf_setup.cc), the driver's enable or disable request and the
// Samba printer share, in that order.
#include <sys/ioctl.h>
#include <syslog.h>

#include <string_view>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "share/smb_conf.h"
#include "usb/usb_enable.h"
#include "usb/usb_paths.h"
#include "usb/usblp.h"
#include "xavoprinter.h"

namespace {
constexpr const char *kUnit = xavo::kEnableExtUnit;

constexpr char kLogLockFailed[] = "%s:%d ORLICFileLock() failed.";
constexpr char kLogUnlockFailed[] = "%s:%d unlock LOCK_USBIDMAP failed";
constexpr char kLogExceed[] = "%s:%d Exceed the max number of printers supported.";
constexpr char kLogUpdateFailed[] = "%s:%d %s update entry %s=%s failed.(action=%d)(0x%04X)";
constexpr char kLogConfFailed[] = "%s:%d Set Printer Conf failed(0x%04X), printer=%s";
constexpr char kLogNoBusId[] = "%s:%d delete printer failed: no bus id";
constexpr char kLogSmbFailed[] = "%s:%d update smb.conf failed, printer=%s";

// LOCK_USBIDMAP, with the flag and time-out values the platform expects.
constexpr uint32_t kUsbIdMapLockTake = 0x20006u;
constexpr int32_t kUsbIdMapLockTimeout = 15;
constexpr uint32_t kUsbIdMapLock = ORLIC_LOCK_USBIDMAP;

// The appliance drives two USB printers, lp0 and lp1.
constexpr unsigned long kMaxUsblpNumber = 1;

// LOCK_USBIDMAP for the length of one call.  Every release that fails is
// logged and tried once more before the call returns, on every path: a
// lock left behind would stall every later plug event of the appliance.
class UsbIdMapLock {
public:
    UsbIdMapLock() : held_(ORLICFileLock(kUsbIdMapLockTake, kUsbIdMapLockTimeout) == 0) {}
    UsbIdMapLock(const UsbIdMapLock &) = delete;
    UsbIdMapLock &operator=(const UsbIdMapLock &) = delete;
    ~UsbIdMapLock() {
        if (held_) Release();
        if (releaseFailed_) Unlock();
    }
    bool held() const { return held_; }
    void Release() {
        held_ = false;
        releaseFailed_ = !Unlock();
    }

private:
    static bool Unlock() {
        if (ORLICFileUnlock(kUsbIdMapLock) == 0) return true;
        XSETERR(ERR_UNLOCK);
        XLOG(LOG_ERR, kLogUnlockFailed);
        return false;
    }

    bool held_;
    bool releaseFailed_ = false;
};

// The number after "lp" of a usblp name, saturating; 0 when no digit
// follows.
bool BeyondSupportedPrinters(std::string_view devName) {
    if (!devName.starts_with(xavo::kUsblpPrefix)) return false;
    unsigned long number = 0;
    for (char c : devName.substr(sizeof xavo::kUsblpPrefix - 1)) {
        if (c < '0' || c > '9') break;
        if (number > kMaxUsblpNumber) break;  // already beyond: stop before it can overflow
        number = number * 10 + static_cast<unsigned long>(c - '0');
    }
    return number > kMaxUsblpNumber;
}

// Steps taken under LOCK_USBIDMAP: true when the call goes on to the
// device request, else false with the call's result in *pResult.
bool ChangeUnderLock(int32_t action, const char *szDevName, const char *szBusId, int32_t *pResult) {
    if (action != 0) {
        if (BeyondSupportedPrinters(szDevName)) {
            XLOG(LOG_ERR, kLogExceed);
            *pResult = 0;
            return false;
        }
        if (xavo::PrinterUsbtabUpdate(action, szDevName, szBusId) != 0) {
            XLOG(LOG_ERR, kLogUpdateFailed, xavo::kUsbtabPath, szDevName, szBusId, action, ORLICErrGet());
            *pResult = -1;
            return false;
        }
        if (xavo::PrinterUsbConfSetup(szDevName) != 0) {
            XLOG(LOG_ERR, kLogConfFailed, ORLICErrGet(), szDevName);
            *pResult = -1;
            return false;
        }
        return true;
    }
    if (szDevName != nullptr) {
        if (xavo::PrinterUsbtabUpdate(0, szDevName, szBusId) != 0) {
            XLOG(LOG_ERR, kLogUpdateFailed, xavo::kUsbtabPath, szDevName, szBusId ? szBusId : "", 0, ORLICErrGet());
            *pResult = -1;
            return false;
        }
        return true;
    }
    if (szBusId == nullptr || szBusId[0] == '\0') {
        XLOG(LOG_ERR, kLogNoBusId);
        *pResult = -1;
        return false;
    }
    if (xavo::PrinterUsbtabUpdate(0, nullptr, szBusId) != 0) {
        XLOG(LOG_ERR, kLogUpdateFailed, xavo::kUsbtabPath, "", szBusId, 0, ORLICErrGet());
        *pResult = -1;
        return false;
    }
    // A device known only by its bus ID is gone already: no request to
    // send, and the share is not touched.
    *pResult = 0;
    return false;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterEnableExt(int32_t action, const char *szDevName, const char *szBusId) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        // An empty device name is refused here, before the lock and before
        // the table: it would otherwise leave a table line with an empty
        // key behind when the section could not be written.
        if (action != 0 &&
            (szDevName == nullptr || szDevName[0] == '\0' || szBusId == nullptr || szBusId[0] == '\0')) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        UsbIdMapLock lock;
        if (!lock.held()) {
            XLOG(LOG_ERR, kLogLockFailed);
            XSETERR(ERR_LOCK);
            return -1;
        }
        int32_t iResult = 0;
        const bool bGoOn = ChangeUnderLock(action, szDevName, szBusId, &iResult);
        lock.Release();
        if (!bGoOn) return iResult;

        // The driver's request is sent once, without waiting for a busy
        // device: the device is busy only while it prints, and then it is
        // enabled already.
        xavo::Fd fd(XAVOPrinterDevOpen(szDevName, 0));
        if (fd) {
            int iArg = 0;
            (void)ioctl(fd.get(), action != 0 ? xavo::kLpiocEnable : xavo::kLpiocDisable, &iArg);
        }
        if (action != 0 && xavo::PrinterSmbConfSetup() < 0) {
            XLOG(LOG_ERR, kLogSmbFailed, szDevName);
            return -1;
        }
        return 0;
    });
}
