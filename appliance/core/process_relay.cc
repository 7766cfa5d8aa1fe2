// The programs' standard error, relayed to syslog (see StderrRelay).
#include <syslog.h>

#include <cerrno>
#include <cstring>

#include "core/process_child.h"

namespace {

// "lpstat: No destinations added." at debug priority: the name is the
// program's file name.  Most tools begin their messages with it already
// ("lpstat: No destinations added." is lpstat's own line); it is not
// repeated then.
constexpr char kLogProgramLine[] = "%s: %s";
constexpr char kLogTaggedLine[] = "%s";
// A longer line is logged in pieces of this size: what a program writes
// must not grow the caller's memory without bound.
constexpr size_t kMaxLine = 1024;

}  // namespace

namespace xavo::core {

StderrRelay::StderrRelay(const char *szProgram) {
    const char *slash = std::strrchr(szProgram, '/');
    name_ = slash != nullptr ? slash + 1 : szProgram;
}

// Never throws: without memory for a line, the line is dropped, never the
// wait for the program.
void StderrRelay::Feed(const char *pData, size_t cb) noexcept try {
    for (size_t i = 0; i < cb; ++i) {
        if (pData[i] == '\n') {
            Emit(partial_);
            partial_.clear();
            continue;
        }
        partial_ += pData[i];
        if (partial_.size() == kMaxLine) {
            Emit(partial_);
            partial_.clear();
        }
    }
} catch (...) {
    partial_.clear();
}

void StderrRelay::Flush() noexcept {
    Emit(partial_);
    partial_.clear();
}

void StderrRelay::Note(const char *szText) const noexcept { Emit(szText); }

// Control characters (a carriage return, escape sequences from text a
// printer sent) become '?': a log line is one line of plain text.  Blank
// lines say nothing and are left out.
void StderrRelay::Emit(std::string_view line) const noexcept try {
    while (!line.empty() && (line.back() == '\r' || line.back() == ' ' || line.back() == '\t')) line.remove_suffix(1);
    std::string text(line);
    for (char &c : text) {
        const auto u = static_cast<unsigned char>(c);
        if ((u < 0x20 && c != '\t') || u == 0x7F) c = '?';
    }
    if (text.empty()) return;
    const int saved = errno;
    if (text.size() > name_.size() && text.compare(0, name_.size(), name_) == 0 && text[name_.size()] == ':') {
        syslog(LOG_DEBUG, kLogTaggedLine, text.c_str());
    } else {
        syslog(LOG_DEBUG, kLogProgramLine, name_.c_str(), text.c_str());
    }
    errno = saved;
} catch (...) {
}

}  // namespace xavo::core
