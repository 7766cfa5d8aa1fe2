// The C ABI boundary: every exported function is a thin extern "C" adapter
// that runs its C++ body through Boundary(), so that no exception ever
// crosses into the appliance's C callers.  Anything that escapes (in
// practice std::bad_alloc from a container) becomes the operation's failure
// value with ERR_OUT_OF_MEMORY set.
#pragma once

#include <cstdint>
#include <exception>
#include <new>
#include <utility>

#include "xavocore.h"

namespace xavo {

inline constexpr std::uint32_t kErrOutOfMemory = 0x0200;

template <class R, class F>
R Boundary(const char *szUnit, int iLine, R failure, F &&body) noexcept {
    try {
        return std::forward<F>(body)();
    } catch (...) {
        ORLICErrSetEx(kErrOutOfMemory, szUnit, iLine);
        return failure;
    }
}

}  // namespace xavo

// XAVO_EXPORT marks the 47 operations; the version script keeps everything
// else local.
#define XAVO_EXPORT extern "C" __attribute__((visibility("default")))

// Body of an exported function returning int32_t: XAVO_BOUNDARY(-1, [&] {...})
#define XAVO_BOUNDARY(failure, ...) ::xavo::Boundary(kUnit, __LINE__, (failure), __VA_ARGS__)
