// The USB/IP sharing service's status files and tool, as the hooks and the
// queue text reader reach them.
#pragma once

namespace xavo {

// One key-value file per shared printer, written only by the service.
inline constexpr char kUsbipStatusFormat[] = "/tmp/usbip_%s";
inline constexpr char kBindDriver[] = "/usr/bin/bind_driver";

}  // namespace xavo
