// Runs the xavoprinter command as a child process inside the test's
// sandbox, as an appliance service or an operator would run it.
#pragma once

#include <sys/wait.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include <nlohmann/json.hpp>

#include "sandbox/sandbox.h"

namespace xavo::test {

struct CliRun {
    int status;  // exit status, -1 when the command did not exit normally
    std::string out, err;
};

inline std::string ShellQuoted(const std::string &word) {
    std::string quoted = "'";
    for (char c : word) quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return quoted + "'";
}

// Runs the command with the given arguments and standard input.
inline CliRun Cli(const std::vector<std::string> &args, const std::string &input = "") {
    PlaceFile("/tmp/cli.in", input);
    std::string cmd = XAVO_CLI_PATH;
    for (const std::string &a : args) cmd += " " + ShellQuoted(a);
    cmd += " </tmp/cli.in 2>/tmp/cli.err";
    CliRun run{};
    FILE *p = popen(cmd.c_str(), "r");
    std::array<char, 4096> buf{};
    size_t n;
    while ((n = fread(buf.data(), 1, buf.size(), p)) > 0) run.out.append(buf.data(), n);
    const int st = pclose(p);
    run.status = WIFEXITED(st) ? WEXITSTATUS(st) : -1;
    run.err = ReadFile("/tmp/cli.err");
    return run;
}

// What is wrong with the shape every --json run must have ("" when
// nothing): one line of strict JSON, one object, "ok" a boolean, "notes" an array, "error" null on
// success and {code, name, message} on failure.
inline std::string JsonShapeProblem(const std::string &text) {
    if (text.empty() || text.back() != '\n' || text.find('\n') != text.size() - 1) return "not one line";
    if (!nlohmann::ordered_json::accept(text)) return "not strict JSON";
    const nlohmann::ordered_json j = nlohmann::ordered_json::parse(text);
    if (!j.is_object() || !j.contains("ok") || !j["ok"].is_boolean()) return "no boolean \"ok\"";
    if (!j.contains("notes") || !j["notes"].is_array()) return "no \"notes\" array";
    if (!j.contains("error")) return "no \"error\"";
    const auto &e = j["error"];
    if (j["ok"].get<bool>()) return e.is_null() ? "" : "\"error\" set on success";
    if (!e.is_object() || e.size() != 3 || !e.contains("code") || !e.contains("name") || !e["message"].is_string()) {
        return "\"error\" is not {code, name, message}";
    }
    if (e["message"].get<std::string>().empty()) return "empty error message";
    return "";
}

// The keys of a JSON object, in order.
inline std::vector<std::string> JsonKeys(const std::string &text) {
    std::vector<std::string> keys;
    const nlohmann::ordered_json j = nlohmann::ordered_json::parse(text);
    for (const auto &[key, value] : j.items()) keys.push_back(key);
    return keys;
}

}  // namespace xavo::test
