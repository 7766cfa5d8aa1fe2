// main() of every test executable: the suite runs inside the sandbox, and
// each test (or each per-suite suite) starts from a fresh one.
#include <gtest/gtest.h>

#include <string>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace {

class SandboxRenewal : public testing::EmptyTestEventListener {
    void OnTestSuiteStart(const testing::TestSuite &suite) override {
        if (xavo::test::detail::IsPerSuite(suite.name())) xavo::test::ResetSandbox();
    }
    void OnTestStart(const testing::TestInfo &test) override {
        if (!xavo::test::detail::IsPerSuite(test.test_suite_name())) xavo::test::ResetSandbox();
    }
    void OnTestEnd(const testing::TestInfo &test) override {
        if (!xavo::test::detail::IsPerSuite(test.test_suite_name())) {
            xavo::test::detail::ReportLeftovers(std::string(test.test_suite_name()) + "." + test.name());
        }
    }
    void OnTestSuiteEnd(const testing::TestSuite &suite) override {
        if (xavo::test::detail::IsPerSuite(suite.name())) xavo::test::detail::ReportLeftovers(suite.name());
    }
    void OnTestProgramEnd(const testing::UnitTest &) override { xavo::test::detail::StopLeftovers(); }
};

}  // namespace

int main(int argc, char **argv) {
    // unshare() of the mount namespace refuses a process with threads.
    xavo::test::EnterSandbox();
    testing::InitGoogleTest(&argc, argv);
    testing::UnitTest::GetInstance()->listeners().Append(new SandboxRenewal);
    return RUN_ALL_TESTS();
}
