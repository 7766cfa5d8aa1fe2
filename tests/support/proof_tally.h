// The figure a proof prints: how many cases it tried and how many failed,
// as one line "NAME: N tried, M failed" when the proof ends, however it
// ends (an assertion that stops it early included); a failed case fails it.
#pragma once

#include <gtest/gtest.h>

#include <cstdio>
#include <string>

namespace xavo::test {

struct Tally {
    const char *szName;
    int tried = 0;
    int failed = 0;

    explicit Tally(const char *szProof) : szName(szProof) {}
    Tally(const Tally &) = delete;
    Tally &operator=(const Tally &) = delete;
    ~Tally() {
        std::printf("%s: %d tried, %d failed\n", szName, tried, failed);
        std::fflush(stdout);
        EXPECT_EQ(failed, 0) << szName;
    }

    // Counts one case; its outcome, for the test's own assertion.
    bool Check(bool bOk) {
        ++tried;
        if (!bOk) ++failed;
        return bOk;
    }
    // The same, failing the test with what went wrong.
    bool Check(bool bOk, const std::string &what) {
        if (!Check(bOk)) ADD_FAILURE() << what;
        return bOk;
    }
};

}  // namespace xavo::test
