// The USB printer table and how the USB library is asked about printers.
#pragma once

#include <cstdint>

namespace xavo {

inline constexpr char kUsbtabPath[] = "/tmp/usbtab";
// Key-value line of the table: lp0="1-1.2".
inline constexpr char kUsbtabLineFormat[] = "%s=\"%s\"\n";
// A usblp device's name: "lp" and its number.
inline constexpr char kUsblpPrefix[] = "lp";
// The two printer kinds of the USB library.
inline constexpr std::uint32_t kUsbPrinterKinds = 0x0Cu;

}  // namespace xavo
