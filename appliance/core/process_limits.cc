// How long each program the appliance runs may take before the runner
// stops it (see process_wait.cc), and the test control that shortens it.
//
// A limit is the time the program needs on a loaded appliance in the worst
// case that is still normal, with room to spare: a wedged cupsd or an SNMP
// agent that trickles answers must not hold the hotplug handler or the web
// page that called the library for longer, and nothing waits more than 5
// minutes.
#include <algorithm>
#include <atomic>
#include <cstring>

#include "common/appliance.h"
#include "core/internal.h"
#include "core/process_child.h"
#include "standin_control.h"

namespace {

struct ToolLimit {
    const char *szProgram;
    int32_t iSeconds;
    const char *szReason;
};

constexpr ToolLimit kToolLimits[] = {
    {"/usr/bin/lpstat", 30, "one answer of the local cupsd, even with many queues"},
    {"/usr/bin/lpq", 30, "one queue's jobs from the local cupsd"},
    {"/usr/bin/lprm", 30, "cancels the queued jobs in one request to cupsd"},
    {"/usr/bin/cupsenable", 30, "one request to cupsd"},
    {"/usr/bin/cupsdisable", 30, "one request to cupsd"},
    {"/usr/bin/lpadmin", 60, "creating a queue makes cupsd copy and check its PPD file"},
    {"/usr/bin/lpr", 120, "copies the whole document into cupsd's spool"},
    {"/usr/bin/snmpwalk", 180,
     "a walk of the enterprises subtree is many requests, each retried up to 5 times 1 s apart "
     "before the walk ends; a printer with a large subtree answers slowly"},
    {"/usr/xavo/sbin/avahi-browse", 30, "waits for the mDNS answers of the network, then resolves each"},
    {"/usr/lib/cups/backend/bjnp", 30, "broadcasts and listens for the BJNP answers for a few seconds"},
    {"/bin/ping", 10, "the library asks for a 1 s deadline; name lookups are not made"},
    {"/bin/mkdir", 30, "one directory on local storage"},
    {"/bin/cp", 60, "a PPD file of a few megabytes on local storage"},
    {"/bin/rm", 120, "empties the spool, which may hold many large files"},
    {"/usr/bin/bind_driver", 60, "binds or releases a USB device for USB/IP, which waits for the device"},
    {"/usr/sbin/cupsd", 60, "returns once the daemon has read its configuration and is up"},
    {"/usr/sbin/avahi-daemon", 30, "returns once the daemon runs"},
};
// Programs the table does not name (other callers of the platform).
constexpr int32_t kDefaultSeconds = 60;
constexpr int32_t kMaxSeconds = 300;

// Set by tests only; 0: the table's limits.
std::atomic<int32_t> gOverrideSeconds{0};

static_assert([] {
    for (const ToolLimit &t : kToolLimits) {
        if (t.iSeconds <= 0 || t.iSeconds > kMaxSeconds || t.szReason[0] == '\0') return false;
    }
    return kDefaultSeconds <= kMaxSeconds;
}());

}  // namespace

namespace xavo::core {

Clock::duration ToolTimeLimit(const char *szProgram) {
    int32_t seconds = gOverrideSeconds.load(std::memory_order_relaxed);
    if (seconds <= 0) {
        seconds = kDefaultSeconds;
        for (const ToolLimit &t : kToolLimits) {
            if (std::strcmp(t.szProgram, szProgram) == 0) seconds = t.iSeconds;
        }
    }
    return std::chrono::seconds(seconds);
}

void ResetToolTimeLimit() { gOverrideSeconds.store(0, std::memory_order_relaxed); }

}  // namespace xavo::core

XAVO_PLATFORM_API void XavoStandinSetToolTimeLimit(int32_t iSeconds) {
    gOverrideSeconds.store(iSeconds <= 0 ? 0 : std::min(iSeconds, kMaxSeconds), std::memory_order_relaxed);
}
