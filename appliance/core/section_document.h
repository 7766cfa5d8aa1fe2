// A section file's text as the section operations see it: the sections of
// one name found by searching for their header, and the edits the
// operations make, each built in one pass over the text.
//
// A setup of the printer library reads a section, adds it and, when it
// exists, replaces it: three operations on one file in a row.  The text
// read by the first is kept for the next ones as long as the file on disk
// is still the one that was read (same inode, size and change times,
// checked with one lstat), so a setup reads the file once.
#pragma once

#include <cstddef>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "common/text_files.h"

namespace xavo::core {

class SectionDocument {
public:
    // Byte offsets into the text.
    struct Section {
        size_t header = 0;   // start of the "[name]" line
        size_t body = 0;     // start of the line after it
        size_t bodyEnd = 0;  // one past the last key line (body when none)
    };

    explicit SectionDocument(std::string text) : text_(std::move(text)) {}
    SectionDocument(const SectionDocument &) = delete;
    SectionDocument &operator=(const SectionDocument &) = delete;

    // The sections of the name, in file order.  Only the header lines of
    // that name and the bodies behind them are looked at, not the whole
    // file's lines.
    std::vector<Section> Named(std::string_view name) const;
    // The key lines of the given sections, in file order, with the offsets
    // of their line starts.
    std::vector<std::pair<size_t, xavo::platform::KeyValue>> KeyLines(const std::vector<Section> &found) const;

    // The text with text appended, on a line of its own.
    std::string Appended(std::string_view text) const;
    // The text with the first of the sections (in file order, not empty)
    // replaced by replacement and the others removed.
    std::string Replaced(const std::vector<Section> &found, std::string_view replacement) const;
    // The text with the line starting at offset at replaced by line, or with
    // line inserted there (after a newline the line before may lack).
    std::string WithLine(size_t at, bool bReplace, std::string_view line) const;

private:
    size_t LineEnd(size_t at) const;
    std::string_view Line(size_t at) const { return std::string_view(text_).substr(at, LineEnd(at) - at); }
    // The start of the line holding pos when only blanks precede pos on it.
    std::optional<size_t> LineStartBefore(size_t pos) const;
    // The start of the first header line at or after the line start from,
    // or the text's end.
    size_t NextHeader(size_t from) const;
    std::vector<Section> Search(std::string_view name) const;

    std::string text_;
    mutable std::mutex memoMutex_;
    mutable std::optional<std::pair<std::string, std::vector<Section>>> memo_;
};

using DocumentPtr = std::shared_ptr<const SectionDocument>;

// The parsed file at szPath: the one parsed last by this process when the
// file is still that one, else read and parsed now.  Null with the last
// error set (ERR_OPEN, under szUnit and iLine) when it cannot be read; a
// missing file reads as an empty one when bMissingIsEmpty.
DocumentPtr LoadSectionDocument(const char *szPath, bool bMissingIsEmpty, const char *szUnit, int iLine);
// Drops the parse kept for szPath: called by every writer of the file.
void ForgetSectionDocument(const char *szPath);

}  // namespace xavo::core
