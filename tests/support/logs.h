// Captured syslog lines in a form tests compare exactly: "<priority> text",
// with the source line number of the "unit:line " prefix written as "N" so
// that a test pins the message and its priority, not the line it sits on.
#pragma once

#include <regex>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"

namespace xavo::test {

inline std::string NormaliseLogLine(const LogLine &line) {
    static const std::regex kUnitLine("^([a-z_]+):[0-9]+ ");
    return std::to_string(line.priority) + " " + std::regex_replace(line.message, kUnitLine, "$1:N ",
                                                                    std::regex_constants::format_first_only);
}

// Every line logged since the last call, normalised.
inline std::vector<std::string> Logs() {
    std::vector<std::string> out;
    for (const LogLine &line : TakeLogs()) out.push_back(NormaliseLogLine(line));
    return out;
}

}  // namespace xavo::test
