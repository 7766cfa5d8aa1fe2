// Sweeping an operation's platform failures: the operation runs once per
// platform call it makes, with that call failed, until a run makes no call
// that could be failed.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>

#include "appliance/standin_control.h"
#include "sandbox/sandbox.h"

namespace xavo::test {

// The code every failed call reports, told apart from the library's own.
inline constexpr std::uint32_t kInjectedCode = 0x0B00;

// setup() prepares a fresh sandbox, run() calls the operation, check() is
// given the name of the failed platform operation and the result.
inline void SweepFailures(const std::function<void()> &setup, const std::function<std::int32_t()> &run,
                          const std::function<void(const std::string &, std::int32_t)> &check) {
    for (int n = 1; n < 500; ++n) {
        ResetSandbox();
        setup();
        XavoStandinReset();
        XavoStandinFailCall("*", n, kInjectedCode);
        const std::int32_t result = run();
        const char *szFailed = XavoStandinLastFailed();
        const std::string failed = szFailed ? szFailed : "";
        XavoStandinReset();
        if (failed.empty()) {
            // A sweep that failed nothing would pass whatever the operation does.
            EXPECT_GT(n, 1) << "no platform call of the operation was failed";
            return;
        }
        SCOPED_TRACE("failed call " + std::to_string(n) + ": " + failed);
        check(failed, result);
    }
    ADD_FAILURE() << "the sweep did not run out of platform calls";
}

}  // namespace xavo::test
