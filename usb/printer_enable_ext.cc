// A USB printer comes or goes: the USB printer table, the printer's
// section of the printer configuration file, the driver's enable or
// disable request and the Samba printer share, in that order.
#include <strings.h>
#include <sys/ioctl.h>
#include <syslog.h>

#include <cstring>
#include <string_view>

#include "conf/conf_paths.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "share/smb_conf.h"
#include "usb/usb_paths.h"
#include "usb/usb_printer_id.h"
#include "usb/usblp.h"
#include "xavoprinter.h"
#include "xavousb.h"

namespace {
constexpr char kUnit[] = "printer_enable_ext";

constexpr char kLogLockFailed[] = "%s:%d ORLICFileLock() failed.";
constexpr char kLogUnlockFailed[] = "%s:%d unlock LOCK_USBIDMAP failed";
constexpr char kLogExceed[] = "%s:%d Exceed the max number of printers supported.";
constexpr char kLogUpdateFailed[] = "%s:%d %s update entry %s=%s failed.(action=%d)(0x%04X)";
constexpr char kLogConfFailed[] = "%s:%d Set Printer Conf failed(0x%04X), printer=%s";
constexpr char kLogNoBusId[] = "%s:%d delete printer failed: no bus id";
constexpr char kLogSmbFailed[] = "%s:%d update smb.conf failed, printer=%s";
constexpr char kLogSetUsbtabFailed[] = "%s:%d Set usbtab failed, devname=%s, device=%s";
constexpr char kLogRmUsbtabFailed[] = "%s:%d rm usbtab failed, key=%s";
constexpr char kLogDevInfoFailed[] = "%s:%d XAVOUSBDevGetInfo failed. (0x%04X)";
constexpr char kLogWrongPrinterId[] = "%s:%d wrong printer id format! errno=0x[%X]";
constexpr char kLogNoDeviceId[] = "%s:%d Bad parameter";
constexpr char kLogSetupFailed[] = "%s:%d setup printer.conf fail! (printerid: %s),[0x%04X %s:%d]";

// LOCK_USBIDMAP, with the flag and time-out values the platform expects.
constexpr uint32_t kUsbIdMapLockTake = 0x20006u;
constexpr int32_t kUsbIdMapLockTimeout = 15;
constexpr uint32_t kUsbIdMapLock = ORLIC_LOCK_USBIDMAP;

// The appliance drives two USB printers, lp0 and lp1.
constexpr unsigned long kMaxUsblpNumber = 1;
constexpr char kUsblpPrefix[] = "lp";

// Texts taken from the USB library or the device go into these fields with
// at most 127 characters.
constexpr int64_t kDeviceTextSize = 128;
constexpr int32_t kHashCapacity = 1024;
constexpr int32_t kListCapacity = 1024;
constexpr char kModelKey[] = "MDL:";
constexpr char kDescriptionKey[] = "DES:";
constexpr char kKeyMode[] = "mode";
constexpr char kModeUsbip[] = "usbip";
constexpr char kModeLpr[] = "lpr";

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
    if (!devName.starts_with(kUsblpPrefix)) return false;
    unsigned long number = 0;
    for (char c : devName.substr(sizeof kUsblpPrefix - 1)) {
        if (c < '0' || c > '9') break;
        if (number > kMaxUsblpNumber) break;  // already beyond: stop before it can overflow
        number = number * 10 + static_cast<unsigned long>(c - '0');
    }
    return number > kMaxUsblpNumber;
}

// A text can be a key or a value of the table only if it cannot end or
// break its line: "=" and '"' split a line, a line break starts another.
bool FitsTableLine(std::string_view text) {
    for (unsigned char c : text) {
        if (c == '=' || c == '"' || c < 0x20 || c == 0x7f) return false;
    }
    return true;
}

int32_t RemoveByBusId(const char *szBusId) {
    xavo::SzHash hash(ORLICSzHashAlloc(kHashCapacity));
    xavo::SzList keys(ORLICSzListAlloc(kListCapacity));
    if (!hash || !keys) {
        XSETERR(ERR_OUT_OF_MEMORY);
        return -1;
    }
    if (ORLICFileGetPair(xavo::kUsbtabPath, hash.addr()) <= 0) return 0;  // no table: nothing to remove
    const int32_t iKeys = ORLICSzHashEnumKey(hash.get(), keys.addr());
    if (iKeys < 0) return -1;
    const size_t cbBusId = std::strlen(szBusId);
    for (int i = 0; i < xavo::ListCount(keys.get()); ++i) {
        const char *szKey = xavo::ListItem(keys.get(), i);
        if (std::strncmp(szKey, kUsblpPrefix, sizeof kUsblpPrefix - 1) != 0) continue;
        const char *szValue = ORLICSzHashGetValue(hash.get(), szKey);
        // A prefix match: "1-1" also takes out "1-1.2", the devices behind
        // a hub on that port.
        if (szValue == nullptr || strncasecmp(szValue, szBusId, cbBusId) != 0) continue;
        if (ORLICFileRemoveKey(xavo::kUsbtabPath, szKey) < 0) {
            XLOG(LOG_ERR, kLogRmUsbtabFailed, szKey);
            return -1;
        }
    }
    return 0;
}

}  // namespace

namespace xavo {

// Sets (action non-zero) or removes (action 0) lines of the USB printer
// table: removal by device name when no bus ID is given, else by bus ID.
int32_t PrinterUsbtabUpdate(int32_t action, const char *szDevName, const char *szBusId) {
    if (action != 0) {
        if (szDevName == nullptr || szDevName[0] == '\0' || szBusId == nullptr || szBusId[0] == '\0' ||
            !FitsTableLine(szDevName) || !FitsTableLine(szBusId)) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        if (ORLICFileSetKeyValue(kUsbtabPath, szDevName, szBusId, kUsbtabLineFormat) < 0) {
            XLOG(LOG_ERR, kLogSetUsbtabFailed, szDevName, szBusId);
            return -1;
        }
        return 0;
    }
    // An empty bus ID would match every printer's line.  Beside a device
    // name it can only mean "this device": remove by name.  Alone it
    // names nothing.
    if (szBusId != nullptr && szBusId[0] == '\0') {
        if (szDevName == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        szBusId = nullptr;
    }
    if (szBusId != nullptr) return RemoveByBusId(szBusId);
    if (szDevName == nullptr) {
        XSETERR(ERR_BAD_PARAMETERS);
        return -1;
    }
    if (ORLICFileRemoveKey(kUsbtabPath, szDevName) < 0) {
        XLOG(LOG_ERR, kLogRmUsbtabFailed, szDevName);
        return -1;
    }
    return 0;
}

// Writes the section of the printer behind szDevName from what the USB
// library and the device itself report.
int32_t PrinterUsbConfSetup(const char *szDevName) {
    if (szDevName == nullptr || szDevName[0] == '\0') {
        XSETERR(ERR_BAD_PARAMETERS);
        return -1;
    }
    XAVOUSBDevInfo info{};
    if (XAVOUSBDevGetInfo(szDevName, &info) < 0) {
        XLOG(LOG_ERR, kLogDevInfoFailed, ORLICErrGet());
        return -1;
    }
    char szPrinterId[kUsbPrinterIdSize] = {};
    if (!UsbPrinterId(info, szPrinterId)) {
        XLOG(LOG_ERR, kLogWrongPrinterId, ORLICErrGet());
        return -1;
    }

    SzHash stored(ORLICSzHashAlloc(kHashCapacity));
    if (!stored) {
        XSETERR(ERR_OUT_OF_MEMORY);
        return -1;
    }
    // A missing section leaves the hash empty: a first plug-in.
    ORLICFileGetSection(kPrinterConfPath, szPrinterId, stored.addr());

    UsbPrinterConf conf{};
    CopyText(conf.szPrinterId, szPrinterId);

    // A device that cannot be read leaves the buffer empty: the section is
    // then written from the USB library's texts.
    char szDeviceId[kUsblpDeviceIdSize] = {};
    XAVOPrinterGetStringId(szDevName, szDeviceId, sizeof szDeviceId);
    const std::string_view deviceId(szDeviceId, strnlen(szDeviceId, sizeof szDeviceId));
    if (deviceId.empty()) {
        XLOG(LOG_ERR, kLogNoDeviceId);
    } else {
        CopyText(conf.szUsblpStringId, deviceId);
        // The model as the device names it, the key spelled exactly; the
        // description stands in for devices that give no model.
        size_t at = deviceId.find(kModelKey);
        if (at == std::string_view::npos) at = deviceId.find(kDescriptionKey);
        if (at != std::string_view::npos) {
            std::string_view model = deviceId.substr(at + sizeof kModelKey - 1);
            CopyText(conf.szProductName, kDeviceTextSize, model.substr(0, model.find(';')));
        }
    }
    if (conf.szProductName[0] == '\0') CopyText(conf.szProductName, kDeviceTextSize, FieldText(info.szProduct));
    CopyText(conf.szProducer, kDeviceTextSize, FieldText(info.szManufacturer));

    // "lpr" was the mode of older firmware; such printers move to USB/IP
    // sharing.  A mode chosen by the user otherwise stays.
    const char *szMode = ORLICSzHashGetValue(stored.get(), kKeyMode);
    if (szMode == nullptr || szMode[0] == '\0' || strcasecmp(szMode, kModeLpr) == 0) {
        CopyText(conf.szMode, kModeUsbip);
    }

    if (XAVOPrinterConfSetup(&conf, 0) < 0) {
        XLOG(LOG_ERR, kLogSetupFailed, szPrinterId, XERR_TAIL);
        return -1;
    }
    return 0;
}

}  // namespace xavo

namespace {

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
