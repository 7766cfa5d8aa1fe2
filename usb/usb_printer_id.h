// A USB printer's printer ID: the name of its section in the printer
// configuration file, formed one way for the enable flow that writes the
// section and for the listings that hand it to callers, so that an ID
// learned from a listing always finds its section.
#pragma once

#include <cstddef>

#include "xavousb.h"

namespace xavo {

// A printer ID is formed in 128 bytes: at most 127 characters, longer text
// (the USB library keeps serial numbers of up to 127 characters, and puts
// vendor and product before them) is cut.
inline constexpr size_t kUsbPrinterIdSize = 128;

// The USB library's own printer ID text, cut to fit.  False when it gives
// none, or one that cannot name a section.
bool UsbLibraryPrinterId(const XAVOUSBDevInfo &info, char (&szId)[kUsbPrinterIdSize]);

// The printer ID the enable flow names the section by: the USB library's
// text, else "%04x:%04x:%s" of vendor ID, product ID and serial number.
// False when the device has none that can name a section.
bool UsbPrinterId(const XAVOUSBDevInfo &info, char (&szId)[kUsbPrinterIdSize]);

}  // namespace xavo
