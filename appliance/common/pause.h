// Bounded waiting of the stand-ins: a deadline on the monotonic clock and
// a pause that is the platform's own.
#pragma once

#include <time.h>

#include <cerrno>
#include <chrono>

namespace xavo::platform {

class Deadline {
public:
    explicit Deadline(std::chrono::milliseconds within) : end_(std::chrono::steady_clock::now() + within) {}
    bool Passed() const { return std::chrono::steady_clock::now() >= end_; }

private:
    std::chrono::steady_clock::time_point end_;
};

// clock_nanosleep, not sleep()/usleep(): the waiting is the platform's own
// and must not look like the caller's.
inline void Pause(long ns) {
    timespec ts{0, ns};
    while (clock_nanosleep(CLOCK_MONOTONIC, 0, &ts, &ts) == EINTR) {
    }
}

}  // namespace xavo::platform
