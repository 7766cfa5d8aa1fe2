// What one run of the xavoprinter command prints: readable text, or with
// --json one JSON object whose shape is fixed per subcommand.  Every key a
// subcommand can print is declared up front and printed on every run, null
// when the run learned nothing for it, so that scripts never have to guess
// which keys exist; "ok" and "error" are always there.
#pragma once

#include <cstdint>
#include <algorithm>
#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

#include <nlohmann/json.hpp>

namespace cli {

using Json = nlohmann::ordered_json;

// "ERR_BAD_PARAMETERS" for a platform error code, "" for one the header
// does not name.
std::string ErrorName(std::uint32_t uCode);
// "0x0D00 ERR_BAD_PARAMETERS", or "0x1234" for an unnamed code.
std::string ErrorCodeText(std::uint32_t uCode);
// Clears the platform's last error, so that a code read after the next
// call was set by that call and not left over from an earlier one.
void ResetPlatformError();

// Text that came from a printer, a file or the user, made safe for a
// terminal: control characters (C0, DEL, C1) and bytes that are not UTF-8
// are shown as \xNN, a backslash as \\.
std::string SafeText(std::string_view text);

class Report {
public:
    Report(bool bJson, std::initializer_list<const char *> keys);

    // Sets a declared key; an undeclared key is a programming error.
    void Set(const std::string &key, Json value);
    // A declared key whose value is a table, an array of objects: text
    // mode shows one line per row, or "(no KEY)".
    void SetTable(const std::string &key, Json rows);
    // A line shown under the result in text mode (on standard error when
    // the run fails), and in JSON under "notes" when any was added.
    void Note(const std::string &line);

    // Prints the result and returns the exit status: 0.
    int Succeed();
    // Prints a failure and returns the exit status: 1.  The sentence says
    // in words what went wrong; the platform's last error, when one is
    // set, follows it as code and name.  WithoutCode is for findings of the
    // command itself (nothing matched), where a left-over code would
    // mislead.
    int Fail(const std::string &sentence);
    // The same with a code read before later calls could change it.
    int Fail(const std::string &sentence, std::uint32_t uCode);
    int FailWithoutCode(const std::string &sentence);

    bool json() const { return json_; }

private:
    int Finish(bool bOk, const Json &error);

    bool json_;
    Json fields_;
    std::vector<std::string> tables_;
    std::vector<std::string> notes_;
};

// Prints a JSON value on one line, invalid UTF-8 replaced.
std::string Dump(const Json &value);

}  // namespace cli
