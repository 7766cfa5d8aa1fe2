// A section file's text parsed once: its lines and sections as views into
// the text, and the edits the section operations make, each built in one
// pass over the text.
//
// A setup of the printer library reads a section, adds it and, when it
// exists, replaces it: three operations on one file in a row.  The parse of
// the first is kept for the next ones as long as the file on disk is still
// the one that was parsed (same inode, size and change times, checked with
// one lstat), so a setup reads and parses the file once.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "common/text_files.h"

namespace xavo::core {

class SectionDocument {
public:
    struct Section {
        std::string_view name;
        size_t header = 0;   // line of "[name]"
        size_t bodyEnd = 0;  // one past the last key line (or the header)
    };

    explicit SectionDocument(std::string text);
    SectionDocument(const SectionDocument &) = delete;
    SectionDocument &operator=(const SectionDocument &) = delete;

    const std::vector<std::string_view> &lines() const { return lines_; }
    // The sections of the name, in file order.
    std::vector<const Section *> Named(std::string_view name) const;
    // The key lines of the given sections, in file order, with their line
    // numbers.
    std::vector<std::pair<size_t, xavo::platform::KeyValue>> KeyLines(const std::vector<const Section *> &found) const;

    // The text with text appended, on a line of its own.
    std::string Appended(std::string_view text) const;
    // The text with the first of the sections (in file order, not empty)
    // replaced by replacement and the others removed.
    std::string Replaced(const std::vector<const Section *> &found, std::string_view replacement) const;
    // The text with line iLine replaced by line, or with line inserted
    // before it (after a newline the line before may lack).
    std::string WithLine(size_t iLine, bool bReplace, std::string_view line) const;

private:
    size_t Offset(size_t iLine) const;

    std::string text_;  // first: the views below point into it
    std::vector<std::string_view> lines_;  // each with its newline
    std::vector<Section> sections_;
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
