// The appliance's services the printer library checks and starts.
#include <atomic>
#include <cstring>
#include <string>
#include <vector>

#include "core/internal.h"
#include "core/process_lookup.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "service";

struct Service {
    const char *name;      // as callers name it
    const char *process;   // command name of its running daemon
    const char *program;   // started with these arguments; daemonises
    std::vector<std::string> argv;
    mutable std::atomic<pid_t> lastFound{0};  // looked at first next time
};

// An array, not a vector: the remembered daemon makes a service immovable.
Service kServices[] = {
    {"cupsd", "cupsd", "/usr/sbin/cupsd", {"/usr/sbin/cupsd"}},
    {"avahi", "avahi-daemon", "/usr/sbin/avahi-daemon", {"/usr/sbin/avahi-daemon", "-D"}},
};

const Service *Find(const char *szService) {
    if (szService == nullptr) return nullptr;
    for (const Service &s : kServices) {
        if (std::strcmp(s.name, szService) == 0) return &s;
    }
    return nullptr;
}

}  // namespace

// 1 running, 0 stopped; -1 with the last error set for a service the
// appliance does not have.
XAVO_PLATFORM_API int32_t ORLIServiceIsRunning(const char *szService) {
    if (XAVO_INJECTED()) return -1;
    const Service *service = Find(szService);
    if (service == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        return xavo::core::FindProcess(service->process, &service->lastFound) != 0 ? int32_t{1} : int32_t{0};
    });
}

// 0 when the service runs already or its start command succeeded (the
// daemons detach once they are up); -1 with the last error set otherwise.
XAVO_PLATFORM_API int32_t ORLIServiceStart(const char *szService, int32_t /*iFlags: none defined; callers pass 0*/) {
    if (XAVO_INJECTED()) return -1;
    const Service *service = Find(szService);
    if (service == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        if (xavo::core::FindProcess(service->process, &service->lastFound) != 0) return int32_t{0};
        Failure failure;
        if (xavo::core::RunAndWait(service->program, service->argv, &failure) != 0) {
            SetError(failure.code, kUnit, failure.line);
            return int32_t{-1};
        }
        return int32_t{0};
    });
}
