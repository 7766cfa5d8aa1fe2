// Finding a program's process: a live process of the name in the caller's
// mount namespace (see process_lookup.cc).
#pragma once

#include <sys/types.h>

#include <atomic>
#include <string_view>

namespace xavo::core {

// The process id, or 0 when none runs.  *pLastFound, when given, holds the
// one found by the previous lookup, which is looked at first, and is
// updated (a service's daemon, asked for before every CUPS check).
pid_t FindProcess(std::string_view name, std::atomic<pid_t> *pLastFound = nullptr);

}  // namespace xavo::core
