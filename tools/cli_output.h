// Output of the xavoprinter command: readable text, or with --json one JSON
// object per run.  Fields are added in order and printed once at the end,
// so that a failing run still prints one well-formed object.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace cli {

// "0x0D00 ERR_BAD_PARAMETERS" for a platform error code.
std::string ErrorCodeText(std::uint32_t uCode);

// A JSON value written as text (strings are escaped when added).
std::string JsonString(const std::string &s);

class Output {
public:
    explicit Output(bool bJson) : json_(bJson) {}

    void Field(const std::string &key, const std::string &value);
    // Without this, a char array would pick the bool overload.
    void Field(const std::string &key, const char *value) { Field(key, std::string(value ? value : "")); }
    void Field(const std::string &key, long long value);
    void Field(const std::string &key, bool value);
    // A list of objects, each a list of string fields.
    using Row = std::vector<std::pair<std::string, std::string>>;
    void Rows(const std::string &key, const std::vector<Row> &rows);
    // Free text shown in text mode only (a step's explanation).
    void Note(const std::string &text);

    // Prints everything; returns the exit status to use.
    int Finish(int exitStatus);
    // A failed operation: records its name and the platform's last error.
    int Fail(const std::string &operation);

    bool json() const { return json_; }

private:
    bool json_;
    std::vector<std::pair<std::string, std::string>> fields_;  // key, JSON text
    std::vector<std::string> text_;                            // text mode lines
};

}  // namespace cli
