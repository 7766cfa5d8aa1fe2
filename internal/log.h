// Logging and error conventions shared by every unit of the library.
//
// Each source unit names itself once:
//     namespace { constexpr char kUnit[] = "printer_conf_unlock"; }
// and then logs with XLOG(priority, FORMAT, args...).  Every format begins
// with "%s:%d ", filled with the unit's bare name and the line, as the
// appliance's log readers expect.  Formats are named constants beside the
// code that uses them and spelled exactly as the appliance logs them.
#pragma once

#include <syslog.h>

#include <cstdint>

#include "xavocore.h"

namespace xavo {

// syslog(3) with a checked format.
void Log(int iPriority, const char *szFormat, ...) __attribute__((format(printf, 2, 3)));

// The argument check of most operations: when bOk is false, logs
// "%s:%d Invaild Argument (%s)=[%d]\n" with the condition's text and 0, and
// sets ERR_BAD_PARAMETERS.  Returns bOk.
bool ArgOk(bool bOk, const char *szCondition, const char *szUnit, int iLine);

}  // namespace xavo

#define XLOG(prio, fmt, ...) ::xavo::Log((prio), fmt, kUnit, __LINE__ __VA_OPT__(, ) __VA_ARGS__)

// The tail "[0x%04X %s:%d]": the platform's last error code, file and line.
#define XERR_TAIL ORLICErrGet(), ORLICErrorGetFile(), ORLICErrorGetLine()

// Sets the platform's last error with this unit's name and line.
#define XSETERR(code) ORLICErrSetEx((code), kUnit, __LINE__)

// XARG_OK(szPrinterId != nullptr, "((void *)0) != szPrinterId"): the
// condition text is given as the appliance logs it (C spelling of NULL).
#define XARG_OK(cond, text) ::xavo::ArgOk((cond), (text), kUnit, __LINE__)
