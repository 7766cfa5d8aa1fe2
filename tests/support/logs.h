// Captured syslog lines in a form tests compare exactly: "<priority> text",
// with the source line number of the "unit:line " prefix written as "N" so
// that a test pins the message and its priority, not the line it sits on.
#pragma once

#include <regex>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"

namespace xavo::test {

// The lines logged since the last call, normalised: the library's own
// (bLibrary), each of which begins with the "unit:line " of the source
// unit that logs, or the others ("7 lpstat: No destinations added."): the
// daemons a test starts, and the tools' standard error, which the platform
// relays at debug priority as "tool: text".
inline std::vector<std::string> TakeLines(bool bLibrary) {
    static const std::regex kUnitLine("^([a-z_]+):[0-9]+ ");
    std::vector<std::string> out;
    for (const LogLine &line : TakeLogs()) {
        if (std::regex_search(line.message, kUnitLine) != bLibrary) continue;
        out.push_back(std::to_string(line.priority) + " " +
                      std::regex_replace(line.message, kUnitLine, "$1:N ", std::regex_constants::format_first_only));
    }
    return out;
}
inline std::vector<std::string> Logs() { return TakeLines(true); }
inline std::vector<std::string> ProgramLogs() { return TakeLines(false); }

// The library's lines of the units whose names begin with unit
// ("printer_net_"), for suites where other units log as well.
inline std::vector<std::string> UnitLogs(const std::string &unit) {
    std::vector<std::string> out;
    for (const std::string &line : Logs()) {
        if (line.find(" " + unit) != std::string::npos) out.push_back(line);
    }
    return out;
}

}  // namespace xavo::test
