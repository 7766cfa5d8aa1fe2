// Pieces of the sandbox shared between its source files (and its own test).
#pragma once

#include <string>
#include <string_view>

#include "sandbox/sandbox.h"

namespace xavo::test::detail {

// Throws std::system_error naming the operation and the path.
[[noreturn]] void ThrowErrno(int err, const std::string &what, const std::string &path);
// mkdir -p; existing directories are left as they are.
void MakeDirs(const std::string &path, mode_t mode = 0755);
// Removes a tree below and including path; missing is fine.
void RemoveTree(const std::string &path);

// syslog capture on the sandbox's /dev/log.
void StartLogCapture();
void ClearLogs();
// One datagram as glibc's syslog() sends it: "<PRI>Mmm dd hh:mm:ss
// ident[pid]: message".  priority is PRI & 7 (-1 when there is no "<PRI>");
// the message is the text after the first ": " that follows the header.
LogLine ParseSyslogDatagram(std::string_view datagram);

// The fake sysfs and the usblp devices back in their default state.
void RestoreSysfs();
void ResetUsblp();
void ResetSleeps();

// Suites registered with XAVO_SANDBOX_PER_SUITE.
bool IsPerSuite(const std::string &suite);
// Tells on stderr which processes started in the sandbox still run after
// "what" ended.
void ReportLeftovers(const std::string &what);
// At the end of the run: stops, by their ids, the processes that are still
// left, so that nothing outlives the test executable.
void StopLeftovers();

}  // namespace xavo::test::detail
