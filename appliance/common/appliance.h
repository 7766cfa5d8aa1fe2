// What every stand-in of the appliance's platform libraries shares: the
// error codes the platform sets, the C boundary, and the test hook that
// counts calls and fails the ones a test asks for.
#pragma once

#include <cstdint>
#include <exception>
#include <utility>

#include "xavocore.h"

// Exported platform operations; everything else in the stand-ins is hidden.
#define XAVO_PLATFORM_API extern "C" __attribute__((visibility("default")))

extern "C" {
// Implemented by libxavocore and used by every stand-in library: counts a
// call of szOp and tells whether a test asked for this call to fail
// (non-zero, with the code to report in *puCode).  blCanFail is 0 for the
// operations that have no failure value (error state, lookups); they are
// counted but never failed.
__attribute__((visibility("default"))) int32_t XavoStandinEnter(const char *szOp, int32_t blCanFail,
                                                                uint32_t *puCode);
}

namespace xavo::platform {

// Codes the platform reports; the same numbering as the appliance's.
inline constexpr uint32_t kErrBufTooSmall = 0x0100;
inline constexpr uint32_t kErrOutOfMemory = 0x0200;
inline constexpr uint32_t kErrLock = 0x0400;
inline constexpr uint32_t kErrUnlock = 0x0500;
inline constexpr uint32_t kErrOpen = 0x0900;
inline constexpr uint32_t kErrRead = 0x0A00;
inline constexpr uint32_t kErrWrite = 0x0B00;
inline constexpr uint32_t kErrBadParameters = 0x0D00;
inline constexpr uint32_t kErrKeyNotFound = 0x2000;
inline constexpr uint32_t kErrNotFound = 0x2600;
inline constexpr uint32_t kErrRename = 0x2800;
inline constexpr uint32_t kErrExec = 0x2A00;

// Where and why an internal step failed, reported through the last error by
// the exported operation that ran it.
struct Failure {
    uint32_t code = 0;
    int line = 0;
};

inline void SetError(uint32_t uCode, const char *szUnit, int iLine) { ORLICErrSetEx(uCode, szUnit, iLine); }

// True when a test asked for this call of szOp to fail; the last error is
// then set as the operation itself would set it.
inline bool Injected(const char *szOp, const char *szUnit, int iLine) {
    uint32_t uCode = 0;
    if (XavoStandinEnter(szOp, 1, &uCode) == 0) return false;
    SetError(uCode, szUnit, iLine);
    return true;
}

// Counts a call of an operation that cannot fail.
inline void Counted(const char *szOp) {
    uint32_t uCode = 0;
    XavoStandinEnter(szOp, 0, &uCode);
}

// The C boundary: nothing thrown inside (in practice std::bad_alloc from a
// container) reaches the appliance's C callers; it becomes the operation's
// failure value with the out-of-memory code.
template <class R, class F>
R Guard(const char *szUnit, int iLine, R failure, F &&body) noexcept {
    try {
        return std::forward<F>(body)();
    } catch (...) {
        SetError(kErrOutOfMemory, szUnit, iLine);
        return failure;
    }
}

}  // namespace xavo::platform

#define XAVO_GUARD(failure, ...) ::xavo::platform::Guard(kUnit, __LINE__, (failure), __VA_ARGS__)
#define XAVO_INJECTED() ::xavo::platform::Injected(__func__, kUnit, __LINE__)
