// Operations the core's units share among themselves, outside the exported
// interface (and so not counted by the test controls).
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "common/appliance.h"

namespace xavo::core {

// FNV-1a: the string hash's buckets and the test controls' counter slots.
inline uint32_t HashOf(std::string_view text) {
    uint32_t h = 2166136261u;
    for (char c : text) {
        h ^= static_cast<unsigned char>(c);
        h *= 16777619u;
    }
    return h;
}

// Closes every named lock this process holds (the test controls' reset).
void ReleaseNamedLocks();

// Gives every program its own time limit again (the test controls' reset).
void ResetToolTimeLimit();

// Runs a program with the given arguments (argv[0] first) and waits for it,
// at most its time limit.  The result: the exit status (0 to 255), 128 + N
// when signal N killed it, or -1 when it could not be started, was stopped
// at its limit or could not be waited for (*pFailure then says where).
int32_t RunAndWait(const char *szProgram, const std::vector<std::string> &argv, xavo::platform::Failure *pFailure);

}  // namespace xavo::core
