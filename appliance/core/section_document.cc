#include "core/section_document.h"

#include <sys/stat.h>
#include <time.h>

#include <mutex>

using namespace xavo::platform;

namespace xavo::core {
namespace {

// What tells one version of a file from another.  Every writer of these
// files replaces them by rename, so a new version is a new inode; a change
// made in place (by hand) moves the change time.  The parse is kept only
// while the file holds the same inode with the same size and times.
struct Stamp {
    dev_t dev = 0;
    ino_t ino = 0;
    off_t size = 0;
    timespec mtim{};
    timespec ctim{};

    bool operator==(const Stamp &o) const {
        return dev == o.dev && ino == o.ino && size == o.size && mtim.tv_sec == o.mtim.tv_sec &&
               mtim.tv_nsec == o.mtim.tv_nsec && ctim.tv_sec == o.ctim.tv_sec && ctim.tv_nsec == o.ctim.tv_nsec;
    }
};

// A setup's section calls follow each other within milliseconds (a busy
// printer lock keeps the last of them waiting up to five seconds); a parse
// older than this is read again rather than trusted, and its memory goes
// with the next call.
constexpr long kKeepSeconds = 10;

struct Kept {
    std::string path;
    Stamp stamp;
    time_t since = 0;
    DocumentPtr doc;
};

std::mutex &KeptMutex() {
    static std::mutex mutex;
    return mutex;
}

Kept &KeptDocument() {
    static Kept kept;
    return kept;
}

time_t Now() {
    timespec ts{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &ts);
    return ts.tv_sec;
}

// The stamp of a regular file at the path (a symlink is never one of
// ours: the reader refuses it), or false.
bool StampOf(const char *szPath, Stamp *pStamp) {
    struct stat st {};
    if (::lstat(szPath, &st) != 0 || !S_ISREG(st.st_mode)) return false;
    *pStamp = {st.st_dev, st.st_ino, st.st_size, st.st_mtim, st.st_ctim};
    return true;
}

}  // namespace

SectionDocument::SectionDocument(std::string text) : text_(std::move(text)) {
    for (std::string_view rest = text_; !rest.empty();) lines_.push_back(NextLine(&rest));
    for (size_t i = 0; i < lines_.size(); ++i) {
        if (auto name = ParseSectionHeader(lines_[i])) {
            sections_.push_back({*name, i, i + 1});
        } else if (!sections_.empty() && ParseSectionKeyLine(lines_[i])) {
            sections_.back().bodyEnd = i + 1;
        }
    }
}

std::vector<const SectionDocument::Section *> SectionDocument::Named(std::string_view name) const {
    std::vector<const Section *> found;
    for (const Section &s : sections_) {
        if (s.name == name) found.push_back(&s);
    }
    return found;
}

std::vector<std::pair<size_t, KeyValue>> SectionDocument::KeyLines(const std::vector<const Section *> &found) const {
    std::vector<std::pair<size_t, KeyValue>> keys;
    for (const Section *s : found) {
        for (size_t i = s->header + 1; i < s->bodyEnd; ++i) {
            if (auto kv = ParseSectionKeyLine(lines_[i])) keys.emplace_back(i, *kv);
        }
    }
    return keys;
}

size_t SectionDocument::Offset(size_t iLine) const {
    return iLine < lines_.size() ? static_cast<size_t>(lines_[iLine].data() - text_.data()) : text_.size();
}

std::string SectionDocument::Appended(std::string_view text) const {
    std::string out;
    out.reserve(text_.size() + 1 + text.size());
    out += text_;
    if (!out.empty() && out.back() != '\n') out.push_back('\n');
    out += text;
    return out;
}

std::string SectionDocument::Replaced(const std::vector<const Section *> &found, std::string_view replacement) const {
    std::string out;
    out.reserve(text_.size() + replacement.size());
    size_t next = 0;  // the first line not yet copied
    for (const Section *s : found) {
        out.append(text_, Offset(next), Offset(s->header) - Offset(next));
        if (s == found.front()) out += replacement;
        next = s->bodyEnd;
    }
    out.append(text_, Offset(next));
    return out;
}

std::string SectionDocument::WithLine(size_t iLine, bool bReplace, std::string_view line) const {
    std::string out;
    out.reserve(text_.size() + 1 + line.size());
    out.append(text_, 0, Offset(iLine));
    if (!out.empty() && out.back() != '\n') out.push_back('\n');
    out += line;
    out.append(text_, Offset(bReplace ? iLine + 1 : iLine));
    return out;
}

DocumentPtr LoadSectionDocument(const char *szPath, bool bMissingIsEmpty, const char *szUnit, int iLine) {
    // Stamped before the read: should the file be replaced in between, the
    // parse is of a newer version than the stamp says and is only read
    // again next time, never taken for a newer one.
    Stamp stamp;
    const bool bStamped = StampOf(szPath, &stamp);
    const time_t now = Now();
    if (bStamped) {
        std::lock_guard lock(KeptMutex());
        const Kept &kept = KeptDocument();
        if (kept.doc && kept.path == szPath && kept.stamp == stamp && now - kept.since < kKeepSeconds) return kept.doc;
    }
    std::string text;
    if (!LoadTextFile(szPath, bMissingIsEmpty, &text, szUnit, iLine)) return nullptr;
    auto doc = std::make_shared<const SectionDocument>(std::move(text));
    std::lock_guard lock(KeptMutex());
    Kept &kept = KeptDocument();
    if (bStamped) {
        kept = Kept{szPath, stamp, now, doc};
    } else {
        kept = Kept{};
    }
    return doc;
}

void ForgetSectionDocument(const char *szPath) {
    std::lock_guard lock(KeptMutex());
    Kept &kept = KeptDocument();
    if (kept.path == szPath) kept = Kept{};
}

}  // namespace xavo::core
