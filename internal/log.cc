#include "internal/log.h"

#include <cstdarg>

#include "xavoprinter.h"

namespace xavo {

void Log(int iPriority, const char *szFormat, ...) {
    va_list ap;
    va_start(ap, szFormat);
    vsyslog(iPriority, szFormat, ap);
    va_end(ap);
}

namespace {
constexpr char kLogInvalidArgument[] = "%s:%d Invaild Argument (%s)=[%d]\n";
}

bool ArgOk(bool bOk, const char *szCondition, const char *szUnit, int iLine) {
    if (!bOk) {
        Log(LOG_ERR, kLogInvalidArgument, szUnit, iLine, szCondition, 0);
        ORLICErrSetEx(ERR_BAD_PARAMETERS, szUnit, iLine);
    }
    return bOk;
}

}  // namespace xavo
