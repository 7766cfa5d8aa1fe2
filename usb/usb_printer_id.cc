#include "usb/usb_printer_id.h"

#include <cinttypes>
#include <cstdio>
#include <string>
#include <string_view>

#include "internal/text.h"

namespace xavo {

namespace {
constexpr char kPrinterIdFormat[] = "%04" PRIx32 ":%04" PRIx32 ":%s";

// A printer ID names a section of the printer configuration file; a line
// break in it (from a device's serial number) would break the section's
// header line.  Such a device has no usable printer ID.
bool FitsSectionName(std::string_view id) {
    for (unsigned char c : id) {
        if (IsControlChar(c)) return false;
    }
    return !id.empty();
}
}  // namespace

bool UsbLibraryPrinterId(const XAVOUSBDevInfo &info, char (&szId)[kUsbPrinterIdSize]) {
    CopyText(szId, FieldText(info.szPrinterId));
    return FitsSectionName(szId);
}

bool UsbPrinterId(const XAVOUSBDevInfo &info, char (&szId)[kUsbPrinterIdSize]) {
    if (!FieldText(info.szPrinterId).empty()) return UsbLibraryPrinterId(info, szId);
    const std::string serial(FieldText(info.szSerial));
    CopyText(szId, "");
    if (info.uVendorId != 0 && info.uProductId != 0 && !serial.empty()) {
        std::snprintf(szId, sizeof szId, kPrinterIdFormat, info.uVendorId, info.uProductId, serial.c_str());
    }
    return FitsSectionName(szId);
}

}  // namespace xavo
