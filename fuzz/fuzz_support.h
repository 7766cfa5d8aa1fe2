// What the fuzz targets share: feeding an input to the library's own line
// readers as a tool's output, and checks that stop the run with a message
// libFuzzer reports as a crash (the input is saved beside it).
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "internal/tool_lines.h"

// A property the target expects to hold; a failure is a finding.
#define FUZZ_CHECK(cond)                                                                  \
    do {                                                                                  \
        if (!(cond)) {                                                                    \
            std::fprintf(stderr, "%s:%d property failed: %s\n", __FILE__, __LINE__, #cond); \
            std::abort();                                                                 \
        }                                                                                 \
    } while (0)

namespace xavo::fuzz {

inline std::string_view AsText(const uint8_t *data, size_t size) {
    return std::string_view(reinterpret_cast<const char *>(data), size);
}

// True when part lies inside whole (the parsers answer views into the
// line they were given, never into memory of their own).
inline bool Within(std::string_view part, std::string_view whole) {
    if (part.empty()) return true;
    return part.data() >= whole.data() && part.data() + part.size() <= whole.data() + whole.size();
}

// The input as a program's output stream, read through stdio like a pipe.
class ToolOutput {
public:
    explicit ToolOutput(std::string_view text) : text_(text) {
        // fmemopen refuses an empty buffer; an empty output is a stream at
        // its end, which /dev/null gives as well.
        pStream_ = text_.empty() ? std::fopen("/dev/null", "r") : fmemopen(text_.data(), text_.size(), "r");
        if (pStream_ == nullptr) std::abort();
    }
    ToolOutput(const ToolOutput &) = delete;
    ToolOutput &operator=(const ToolOutput &) = delete;
    ~ToolOutput() { std::fclose(pStream_); }
    FILE *get() const { return pStream_; }

private:
    std::string text_;
    FILE *pStream_ = nullptr;
};

// Runs the library's tool-line reader over the text with a line buffer of
// cbBuf bytes, as the reader of a tool's output does; each trimmed line
// goes to onLine (which answers true to read on).  Also checks what every
// such reader relies on: a line is trimmed, holds no newline and fits the
// buffer.
template <class OnLine>
ToolRead ForEachToolLine(std::string_view text, int cbBuf, OnLine &&onLine) {
    ToolOutput output(text);
    std::string buf(static_cast<size_t>(cbBuf), '\0');
    return ReadToolLines(output.get(), buf.data(), cbBuf, kToolMaxInterruptedReads, [&](char *szLine) {
        std::string_view line(szLine);
        FUZZ_CHECK(line.size() < static_cast<size_t>(cbBuf));
        FUZZ_CHECK(line.find('\n') == std::string_view::npos);
        return onLine(szLine, line);
    });
}

}  // namespace xavo::fuzz
