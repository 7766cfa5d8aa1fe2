// The argument lists of the variadic runners (ORLICExecl, ORLICPopen).
#pragma once

#include <cstdarg>
#include <cstddef>
#include <string>
#include <vector>

namespace xavo::core {

// Bounds the argument lists read from a variadic call, so that a caller
// that forgot the closing NULL fails instead of reading the stack forever.
inline constexpr size_t kMaxArgs = 256;

// Arguments after a fixed one, up to the closing NULL, read before any
// allocation (va_arg cannot be used inside the guarded body).
struct VarArgs {
    const char *args[kMaxArgs];
    size_t count = 0;

    // The program's argument vector: the program, then these arguments.
    std::vector<std::string> Argv(const char *szProgram) const {
        std::vector<std::string> argv{szProgram};
        argv.insert(argv.end(), args, args + count);
        return argv;
    }
};

// False when the list has no closing NULL within kMaxArgs.
inline bool CollectArgs(va_list ap, VarArgs *pArgs) {
    for (pArgs->count = 0; pArgs->count < kMaxArgs; ++pArgs->count) {
        const char *arg = va_arg(ap, const char *);
        if (arg == nullptr) return true;
        pArgs->args[pArgs->count] = arg;
    }
    return va_arg(ap, const char *) == nullptr;
}

}  // namespace xavo::core
