// Test controls of the stand-ins: call counters and failure rules (see
// standin_control.h).  Not part of the appliance's own library.
//
// Every platform call passes through XavoStandinEnter, so its common case
// (no failure rule set) takes no lock: the counters are atomics in a fixed
// table that is only written under the mutex when an operation is first
// seen, and the rule is looked at only while the flag says one is set.
#include <atomic>
#include <cstring>
#include <map>
#include <mutex>
#include <string>

#include "common/appliance.h"
#include "core/internal.h"
#include "standin_control.h"

namespace {

constexpr char kAnyOperation[] = "*";
// Far more than the platform has operations; should a caller bring more
// names than fit, the rest are counted in the map under the mutex.
constexpr size_t kCounterSlots = 256;

struct Rule {
    std::string op;      // an operation's name, or "*"
    int32_t nth = 0;     // 0: no rule
    int32_t count = 0;   // calls to fail from the nth on; -1: all
    uint32_t code = 0;
    int32_t seen = 0;    // matching calls since the rule was set
};

struct Counter {
    std::atomic<const char *> name{nullptr};  // our own copy, never freed
    std::atomic<int32_t> calls{0};
};

struct Control {
    std::mutex mutex;  // guards rule, lastFailed, overflow and new names
    Counter counters[kCounterSlots];
    std::map<std::string, int32_t, std::less<>> overflow;
    std::atomic<int32_t> anyCalls{0};
    std::atomic<bool> bRuleSet{false};
    Rule rule;
    const char *lastFailed = nullptr;
};

Control &State() {
    static Control control;
    return control;
}

size_t SlotOf(std::string_view op) { return xavo::core::HashOf(op) % kCounterSlots; }

// The counter of op, or null when the table is full.  Lock-free once the
// name is in the table; entering a name takes the mutex (the caller must not
// hold it).
Counter *CounterOf(Control &c, std::string_view op, bool bCreate) {
    size_t start = SlotOf(op);
    for (size_t n = 0; n < kCounterSlots; ++n) {
        Counter &slot = c.counters[(start + n) % kCounterSlots];
        const char *name = slot.name.load(std::memory_order_acquire);
        if (name == nullptr) {
            if (!bCreate) return nullptr;
            std::lock_guard lock(c.mutex);
            // Another thread may have taken the slot meanwhile: look again.
            name = slot.name.load(std::memory_order_acquire);
            if (name == nullptr) {
                char *copy = new char[op.size() + 1];
                std::memcpy(copy, op.data(), op.size());
                copy[op.size()] = '\0';
                slot.name.store(copy, std::memory_order_release);
                return &slot;
            }
        }
        if (op == name) return &slot;
    }
    return nullptr;
}

void Count(Control &c, std::string_view op) {
    if (Counter *counter = CounterOf(c, op, true)) {
        counter->calls.fetch_add(1, std::memory_order_relaxed);
        return;
    }
    std::lock_guard lock(c.mutex);
    ++c.overflow[std::string(op)];
}

// Whether the rule fails this call, with its code; the caller holds the
// mutex.
bool RuleFires(Control &c, const char *szOp, uint32_t *puCode) {
    Rule &r = c.rule;
    if (r.nth <= 0 || (r.op != kAnyOperation && r.op != szOp)) return false;
    ++r.seen;
    if (r.seen < r.nth || (r.count >= 0 && r.seen >= r.nth + r.count)) return false;
    c.lastFailed = szOp;
    *puCode = r.code;
    return true;
}

}  // namespace

XAVO_PLATFORM_API int32_t XavoStandinEnter(const char *szOp, int32_t blCanFail, uint32_t *puCode) {
    try {
        Control &c = State();
        Count(c, szOp);
        if (blCanFail == 0) return 0;
        c.anyCalls.fetch_add(1, std::memory_order_relaxed);
        if (!c.bRuleSet.load(std::memory_order_acquire)) return 0;
        std::lock_guard lock(c.mutex);
        return RuleFires(c, szOp, puCode) ? 1 : 0;
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
    for (Counter &counter : c.counters) counter.calls.store(0, std::memory_order_relaxed);
    c.overflow.clear();
    c.anyCalls.store(0, std::memory_order_relaxed);
    c.bRuleSet.store(false, std::memory_order_release);
    c.rule = Rule{};
    c.lastFailed = nullptr;
}

XAVO_PLATFORM_API void XavoStandinFailCalls(const char *szOp, int32_t nth, int32_t iCount, uint32_t uCode) {
    try {
        Control &c = State();
        std::lock_guard lock(c.mutex);
        c.bRuleSet.store(false, std::memory_order_release);
        c.rule = Rule{};
        if (szOp == nullptr || nth <= 0 || iCount == 0) return;
        c.rule = Rule{szOp, nth, iCount < 0 ? -1 : iCount, uCode, 0};
        c.bRuleSet.store(true, std::memory_order_release);
    } catch (...) {
    }
}

XAVO_PLATFORM_API void XavoStandinFailCall(const char *szOp, int32_t nth, uint32_t uCode) {
    XavoStandinFailCalls(szOp, nth, 1, uCode);
}

XAVO_PLATFORM_API int32_t XavoStandinCallCount(const char *szOp) {
    if (szOp == nullptr) return 0;
    Control &c = State();
    if (std::string_view(szOp) == kAnyOperation) return c.anyCalls.load(std::memory_order_relaxed);
    if (Counter *counter = CounterOf(c, szOp, false)) return counter->calls.load(std::memory_order_relaxed);
    std::lock_guard lock(c.mutex);
    auto it = c.overflow.find(std::string_view(szOp));
    return it == c.overflow.end() ? 0 : it->second;
}

XAVO_PLATFORM_API const char *XavoStandinLastFailed(void) {
    Control &c = State();
    std::lock_guard lock(c.mutex);
    return c.lastFailed;
}
