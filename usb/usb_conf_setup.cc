// The printer configuration file's side of a USB printer coming: its
// section, from what the USB library and the device report.
#include <strings.h>
#include <syslog.h>

#include <cstring>
#include <string_view>

#include "conf/conf_paths.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "usb/usb_enable.h"
#include "usb/usb_printer_id.h"
#include "usb/usblp.h"
#include "xavocore.h"
#include "xavoprinter.h"
#include "xavousb.h"

namespace {
// Logged as the operation's own steps.
constexpr const char *kUnit = xavo::kEnableExtUnit;

constexpr char kLogDevInfoFailed[] = "%s:%d XAVOUSBDevGetInfo failed. (0x%04X)";
constexpr char kLogWrongPrinterId[] = "%s:%d wrong printer id format! errno=0x[%X]";
constexpr char kLogNoDeviceId[] = "%s:%d Bad parameter";
constexpr char kLogSetupFailed[] = "%s:%d setup printer.conf fail! (printerid: %s),[0x%04X %s:%d]";

// Texts taken from the USB library or the device go into these fields with
// at most 127 characters.
constexpr int64_t kDeviceTextSize = 128;
constexpr int32_t kHashCapacity = 1024;
constexpr char kModelKey[] = "MDL:";
constexpr char kDescriptionKey[] = "DES:";
constexpr char kKeyMode[] = "mode";
constexpr char kModeUsbip[] = "usbip";
constexpr char kModeLpr[] = "lpr";
}  // namespace

namespace xavo {

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
