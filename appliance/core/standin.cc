// Test controls of the stand-ins: call counters and failure rules (see
// standin_control.h).  Not part of the appliance's own library.
#include <map>
#include <mutex>
#include <string>

#include "common/appliance.h"
#include "core/internal.h"
#include "standin_control.h"

namespace {

constexpr char kAnyOperation[] = "*";

struct Rule {
    std::string op;      // an operation's name, or "*"
    int32_t nth = 0;     // 0: no rule
    int32_t count = 0;   // calls to fail from the nth on; -1: all
    uint32_t code = 0;
    int32_t seen = 0;    // matching calls since the rule was set
};

struct Control {
    std::mutex mutex;
    std::map<std::string, int32_t, std::less<>> calls;
    int32_t anyCalls = 0;
    Rule rule;
    const char *lastFailed = nullptr;
};

Control &State() {
    static Control control;
    return control;
}

}  // namespace

XAVO_PLATFORM_API int32_t XavoStandinEnter(const char *szOp, int32_t blCanFail, uint32_t *puCode) {
    try {
        Control &c = State();
        std::lock_guard lock(c.mutex);
        ++c.calls[szOp];
        if (blCanFail == 0) return 0;
        ++c.anyCalls;
        Rule &r = c.rule;
        if (r.nth <= 0 || (r.op != kAnyOperation && r.op != szOp)) return 0;
        ++r.seen;
        if (r.seen < r.nth || (r.count >= 0 && r.seen >= r.nth + r.count)) return 0;
        c.lastFailed = szOp;
        *puCode = r.code;
        return 1;
    } catch (...) {
        return 0;
    }
}

// Also lets go of the named locks this process holds, so that a lock left
// taken by one test (its unlock failed on purpose) does not outlive it.
XAVO_PLATFORM_API void XavoStandinReset(void) {
    xavo::core::ReleaseNamedLocks();
    xavo::core::ResetToolTimeLimit();
    Control &c = State();
    std::lock_guard lock(c.mutex);
    c.calls.clear();
    c.anyCalls = 0;
    c.rule = Rule{};
    c.lastFailed = nullptr;
}

XAVO_PLATFORM_API void XavoStandinFailCalls(const char *szOp, int32_t nth, int32_t iCount, uint32_t uCode) {
    try {
        Control &c = State();
        std::lock_guard lock(c.mutex);
        c.rule = Rule{};
        if (szOp == nullptr || nth <= 0 || iCount == 0) return;
        c.rule = Rule{szOp, nth, iCount < 0 ? -1 : iCount, uCode, 0};
    } catch (...) {
    }
}

XAVO_PLATFORM_API void XavoStandinFailCall(const char *szOp, int32_t nth, uint32_t uCode) {
    XavoStandinFailCalls(szOp, nth, 1, uCode);
}

XAVO_PLATFORM_API int32_t XavoStandinCallCount(const char *szOp) {
    if (szOp == nullptr) return 0;
    Control &c = State();
    std::lock_guard lock(c.mutex);
    if (std::string_view(szOp) == kAnyOperation) return c.anyCalls;
    auto it = c.calls.find(std::string_view(szOp));
    return it == c.calls.end() ? 0 : it->second;
}

XAVO_PLATFORM_API const char *XavoStandinLastFailed(void) {
    Control &c = State();
    std::lock_guard lock(c.mutex);
    return c.lastFailed;
}
