// Finding a service's daemon: a live process of the name in the caller's
// mount namespace (see daemon_lookup.cc).
#pragma once

#include <sys/types.h>

#include <atomic>
#include <string_view>

namespace xavo::core {

// The daemon's process id, or 0 when none runs.  *pLastFound holds the one
// found by the previous lookup, which is looked at first, and is updated.
pid_t FindDaemon(std::string_view name, std::atomic<pid_t> *pLastFound);

}  // namespace xavo::core
