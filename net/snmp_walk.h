// The SNMP walk both printer lookups run: a version 1 walk of the
// printer's enterprises subtree with the community "public", on the tool's
// own time-out and retry defaults.
#pragma once

#include <cstdio>

#include "xavocore.h"

namespace xavo {

inline constexpr char kSnmpWalkPath[] = "/usr/bin/snmpwalk";

inline FILE *StartSnmpWalk(const char *szIP) {
    return ORLICPopen(kSnmpWalkPath, "r", "-v", "1", "-c", "public", szIP, "enterprises", nullptr);
}

// Output lines are read 1023 bytes at a time.
inline constexpr int kSnmpLineBuffer = 1024;

}  // namespace xavo
