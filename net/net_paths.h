// The network printer table.
#pragma once

#include <cstddef>

namespace xavo {

inline constexpr char kNptabPath[] = "/usr/xavo/etc/nptab";
// Key-value line of the table: 192.168.1.20="office".
inline constexpr char kNptabLineFormat[] = "%s=\"%s\"\n";
// A network printer ID, "%s-%s" of address and CUPS printer name, with its
// NUL fits in this many bytes.
inline constexpr size_t kNetPrinterIdSize = 1024;

}  // namespace xavo
