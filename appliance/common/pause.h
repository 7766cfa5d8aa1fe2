// Bounded waiting of the stand-ins: attempts retried against a deadline on
// the monotonic clock, with a pause that is the platform's own.
#pragma once

#include <time.h>

#include <cerrno>
#include <chrono>
#include <optional>

namespace xavo::platform {

// clock_nanosleep, not sleep()/usleep(): the waiting is the platform's own
// and must not look like the caller's.
inline void Pause(long ns) {
    timespec ts{0, ns};
    while (clock_nanosleep(CLOCK_MONOTONIC, 0, &ts, &ts) == EINTR) {
    }
}

// Calls attempt, pausing ns between calls, until it settles or within has
// passed (it is called at least once).  An attempt answers an empty
// optional while another holder keeps it waiting, and settles with a value
// otherwise; the value, or nothing when the time ran out first.
template <class F>
auto RetryWithin(std::chrono::milliseconds within, long ns, F &&attempt) -> decltype(attempt()) {
    const auto end = std::chrono::steady_clock::now() + within;
    for (;;) {
        if (auto settled = attempt()) return settled;
        if (std::chrono::steady_clock::now() >= end) return std::nullopt;
        Pause(ns);
    }
}

}  // namespace xavo::platform
