// Writing a whole section of the printer configuration file: added when the
// file has none of that name, replaced otherwise.  Every writer of a whole
// section (USB and network printers, the cloud print account) goes through
// here, under the printer lock it holds.
#pragma once

#include <cstdint>

#include "xavocore.h"

namespace xavo {

// 0 when the section was added or replaced; the negative result of the add
// when that failed; -1 when the replace failed (a section that could not be
// replaced is a failed setup, and the platform's error code stays as the
// replace left it).  Failures are logged under the caller's unit and line.
int32_t WriteConfSection(const char *szSection, const ORLICSzHash *pHash, const char *szUnit, int iLine);

}  // namespace xavo

#define XWRITE_CONF_SECTION(section, hash) ::xavo::WriteConfSection((section), (hash), kUnit, __LINE__)
