// Pieces shared by the table-driven suites: readable names for
// parameterised cases, text cut into lines, and a fake program that
// records how it was run.
#pragma once

#include <gtest/gtest.h>

#include <cctype>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"

namespace xavo::test {

// The case's szName, with every character a test name may not hold made
// '_': INSTANTIATE_TEST_SUITE_P(Suite, Fixture, ValuesIn(kCases), CaseName()).
struct CaseName {
    template <class P>
    std::string operator()(const ::testing::TestParamInfo<P> &info) const {
        std::string s = info.param.szName;
        for (char &ch : s) {
            if (!std::isalnum(static_cast<unsigned char>(ch))) ch = '_';
        }
        return s;
    }
};

// The complete lines of text, without their line ends.
inline std::vector<std::string> Lines(const std::string &text) {
    std::vector<std::string> out;
    for (size_t pos = 0, nl; (nl = text.find('\n', pos)) != std::string::npos; pos = nl + 1) {
        out.push_back(text.substr(pos, nl - pos));
    }
    return out;
}

// A program at path that writes each argument on a line of its own to
// /tmp/<name>.argv, adds a line to /tmp/<name>.calls, prints
// /tmp/<name>.out when there is one, and exits with the status kept in
// /tmp/<name>.exit (iExit, or 0 when there is none).
inline void PlaceRecorder(const std::string &path, const std::string &name, int iExit = 0) {
    const std::string tmp = "/tmp/" + name;
    PlaceProgram(path, "#!/bin/sh\n"
                       "for a in \"$@\"; do printf '%s\\n' \"$a\"; done > " + tmp + ".argv\n"
                       "echo run >> " + tmp + ".calls\n"
                       "cat " + tmp + ".out 2>/dev/null\n"
                       "exit $(cat " + tmp + ".exit 2>/dev/null || echo 0)\n");
    if (iExit != 0) PlaceFile(tmp + ".exit", std::to_string(iExit) + "\n");
}

// The arguments of the recorder's last run, and how often it ran.
inline std::vector<std::string> RecordedArgs(const std::string &name) { return Lines(ReadFile("/tmp/" + name + ".argv")); }
inline int Calls(const std::string &name) { return static_cast<int>(Lines(ReadFile("/tmp/" + name + ".calls")).size()); }

}  // namespace xavo::test
