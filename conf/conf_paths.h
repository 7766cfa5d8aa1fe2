// Files of the printer configuration store.
#pragma once

namespace xavo {

inline constexpr char kPrinterConfPath[] = "/usr/xavo/etc/printer.conf";
// Every writer of a whole section hands the platform this key line format.
inline constexpr char kSectionLineFormat[] = "\t%s = %s\n";
inline constexpr char kKeyCupsPrinterName[] = "cups printer name";

}  // namespace xavo
