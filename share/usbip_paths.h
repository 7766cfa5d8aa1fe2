// The USB/IP sharing service's status files and tool, as the hooks and the
// queue text reader reach them.
#pragma once

#include "internal/name_path.h"

namespace xavo {

// One key-value file per shared printer, "/tmp/usbip_" + printer ID,
// written only by the service.
inline constexpr NamedFile kUsbipStatus{"/tmp/usbip_", ""};
inline constexpr char kBindDriver[] = "/usr/bin/bind_driver";

}  // namespace xavo
