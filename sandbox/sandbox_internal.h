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

// A sandbox that cannot be set up must not run a test: the message goes to
// stderr and the process ends with exit code 70.
[[noreturn]] void Die(const std::string &what, int err);
// Die(what, errno) unless ok.
void Must(bool ok, const std::string &what);

// The writable layers (layers.cc).  RememberHostDirs() notes the host's
// directories before anything is mounted over them; BuildDev() puts the
// private /dev in place once; FreshLayers() replaces the overlays and tmpfs
// and lays out what the appliance has at boot.
void RememberHostDirs();
void BuildDev();
void FreshLayers();

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
// Whether this process built the sandbox (rather than joined it or never
// entered one): only the builder renews it and stops what is left.
bool OwnsSandbox();
// Tells on stderr which processes started in the sandbox still run after
// "what" ended.
void ReportLeftovers(const std::string &what);
// At the end of the run: stops, by their ids, the processes that are still
// left, so that nothing outlives the test executable.
void StopLeftovers();

}  // namespace xavo::test::detail
