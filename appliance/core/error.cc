// The platform's last error: code, source unit and line of the most recent
// failure.  These four are not counted by the test controls: the platform
// calls them itself on every failure it reports.
#include <cstring>

#include "common/appliance.h"

namespace {

// Per thread, not per process: the appliance's services call the platform
// from several threads, and a caller reads the error back right after the
// call that failed.  With one error per process another thread's failure
// could land in between and the caller would log a code that is not its
// own.
struct LastError {
    uint32_t uCode = 0;
    char szFile[128] = "";
    int32_t iLine = 0;
};
thread_local LastError tLastError;

}  // namespace

XAVO_PLATFORM_API void ORLICErrSetEx(uint32_t uCode, const char *szFile, int32_t iLine) {
    tLastError.uCode = uCode;
    tLastError.iLine = iLine;
    // A copy: the caller's text may be a buffer that is gone by the time the
    // error is read back.
    const char *src = szFile != nullptr ? szFile : "";
    size_t n = strnlen(src, sizeof tLastError.szFile - 1);
    std::memcpy(tLastError.szFile, src, n);
    tLastError.szFile[n] = '\0';
}

XAVO_PLATFORM_API uint32_t ORLICErrGet(void) {
    return tLastError.uCode;
}

XAVO_PLATFORM_API const char *ORLICErrorGetFile(void) {
    return tLastError.szFile;
}

XAVO_PLATFORM_API int32_t ORLICErrorGetLine(void) {
    return tLastError.iLine;
}
