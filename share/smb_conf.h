// The Samba printer share, set up when a printer is added.
#pragma once

#include <cstdint>

namespace xavo {

// Makes sure that the section "printers" of the Samba share file exists
// with entries: 0 when it did or has now been written, -1 on failure with
// the platform's error code left for the caller's message.
std::int32_t PrinterSmbConfSetup();

}  // namespace xavo
