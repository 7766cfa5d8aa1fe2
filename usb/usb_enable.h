// The steps of XAVOPrinterEnableExt taken under LOCK_USBIDMAP, logged under
// its unit.
#pragma once

#include <cstdint>

namespace xavo {

// The unit all three source files of the operation log under: one name in
// the log, however the steps are split across files.
inline constexpr char kEnableExtUnit[] = "printer_enable_ext";

// Sets (action non-zero) or removes (action 0) lines of the USB printer
// table: removal by device name when no bus ID is given, else by bus ID.
int32_t PrinterUsbtabUpdate(int32_t action, const char *szDevName, const char *szBusId);

// Writes the section of the printer behind szDevName from what the USB
// library and the device itself report.
int32_t PrinterUsbConfSetup(const char *szDevName);

}  // namespace xavo
