// The appliance's small text files: reading them whole and replacing them
// atomically (text_files.cc), and the pure line parsers of the two forms
// the platform writes, section files and key="value" files (text_lines.cc).
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "common/appliance.h"

namespace xavo::platform {

// ---- reading and replacing ------------------------------------------------

enum class ReadResult { kOk, kMissing, kFailed };

// Reads a whole regular file.  A symlink at the path is never followed (the
// appliance keeps some of these files in /tmp, where anybody can plant one)
// and neither is a FIFO or device opened for reading: both are kFailed.
// In a shared directory such as /tmp, a file that is not root's (see
// IsTrustedFile) reads as kMissing: it was planted, and root ignores it.
ReadResult ReadTextFile(const char *szPath, std::string *pText);

// Replaces the file's content atomically: a temporary file in the same
// directory is written, flushed to disk and renamed over the path, so that
// a reader or a writer killed half way sees the old or the new content,
// never a torn one.  An existing file keeps its mode and owner; a new one
// gets 0644.  A symlink (or anything but a regular file) at the path is
// refused, never written through; in a shared directory such as /tmp, such
// a thing or a file that is not root's is replaced by root's own 0644 file.
// The caller holds the file's write lock (replace_lock.h).  On failure the
// file is unchanged and *pFailure tells the code and line to report.
bool ReplaceFile(const char *szPath, std::string_view content, Failure *pFailure);

// Writes all of data, going on after interruptions; false with errno set.
bool WriteAll(int fd, std::string_view data);

// ReadTextFile and ReplaceFile for an exported operation of the stand-ins,
// which report failures through the last error under their own unit's
// name.  Loading fails with ERR_OPEN (also for a symlink or a FIFO planted
// at the path); a missing file reads as an empty one when bMissingIsEmpty.
// Storing fails with the code and line ReplaceFile gives.
bool LoadTextFile(const char *szPath, bool bMissingIsEmpty, std::string *pText, const char *szUnit, int iLine);
bool StoreTextFile(const char *szPath, std::string_view text, const char *szUnit);

// ---- text ---------------------------------------------------------------

std::string_view Trim(std::string_view text);
bool IsControl(char c);
bool HasControl(std::string_view text);

// Splits text into lines, each keeping its newline; a last line without one
// is kept as it is.
std::vector<std::string> SplitLines(std::string_view text);
std::string JoinLines(const std::vector<std::string> &lines);
// The first line of *pRest (with its newline, if it has one), which is
// advanced past it: walks a text's lines without copying them.
std::string_view NextLine(std::string_view *pRest);

// Copies a value read from a file into a caller's buffer (cbBuf > 0), cut
// to fit as fixed-size fields are; the number of characters copied.
int32_t CopyValue(std::string_view value, char *szBuf, int32_t cbBuf);

struct KeyValue {
    std::string_view key;
    std::string_view value;
};

// ---- section files -------------------------------------------------------

// The name of a section header line: the text between the first "[" and the
// last "]" of the line, so that names holding brackets or "=" (printer IDs
// are built from device serial numbers) read back as they were written.
std::optional<std::string_view> ParseSectionHeader(std::string_view line);
// A key line inside a section: key and value trimmed of white space, as
// Samba reads them.  Blank lines, comments ("#", ";") and lines without "="
// give nothing.
std::optional<KeyValue> ParseSectionKeyLine(std::string_view line);

// ---- key-value files -----------------------------------------------------

// key="value": the value without its quotes (a value without quotes is
// taken as it stands).  Blank lines and "#" comments give nothing.
std::optional<KeyValue> ParseKeyValueLine(std::string_view line);

// ---- line formats ----------------------------------------------------------

// Expands a caller's line format holding exactly two "%s" (key, then value;
// "%%" stands for "%") without handing the format to printf, and ends the
// line with a newline if the format does not.  False for any other format.
bool FormatLine(const char *szFormat, std::string_view key, std::string_view value, std::string *pLine);

}  // namespace xavo::platform
