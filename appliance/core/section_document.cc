#include "core/section_document.h"

#include <sys/stat.h>
#include <time.h>

#include <cstring>
#include <mutex>

using namespace xavo::platform;

namespace xavo::core {
namespace {

// What tells one version of a file from another.  Every writer of these
// files replaces them by rename, so a new version is a new inode (should
// the kept one's number be reused, the new file would also need its size,
// and change times within the clock tick of the kept version's own write).
// A change made in place, by hand, moves the times too, unless it falls in
// that same tick.  The text is kept only while the file holds the same
// inode with the same size and times.
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
// printer lock keeps the last of them waiting up to five seconds); a text
// kept longer than this is read again rather than trusted, and its memory
// goes with the next call.
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

size_t SectionDocument::LineEnd(size_t at) const {
    size_t nl = text_.find('\n', at);
    return nl == std::string::npos ? text_.size() : nl + 1;
}

std::optional<size_t> SectionDocument::LineStartBefore(size_t pos) const {
    size_t nl = pos == 0 ? std::string::npos : text_.rfind('\n', pos - 1);
    size_t start = nl == std::string::npos ? 0 : nl + 1;
    if (!Trim(std::string_view(text_).substr(start, pos - start)).empty()) return std::nullopt;
    return start;
}

// A header line is one whose first non-blank character is "[" and that
// ParseSectionHeader takes: the lines the reader starts sections at.
size_t SectionDocument::NextHeader(size_t from) const {
    for (size_t pos = text_.find('[', from); pos != std::string::npos; pos = text_.find('[', pos + 1)) {
        auto start = LineStartBefore(pos);
        if (start && ParseSectionHeader(Line(*start))) return *start;
    }
    return text_.size();
}

std::vector<SectionDocument::Section> SectionDocument::Named(std::string_view name) const {
    {
        // The calls of one setup ask for the same name in turn.
        std::lock_guard lock(memoMutex_);
        if (memo_ && memo_->first == name) return memo_->second;
    }
    std::vector<Section> found = Search(name);
    std::lock_guard lock(memoMutex_);
    memo_.emplace(std::string(name), found);
    return found;
}

std::vector<SectionDocument::Section> SectionDocument::Search(std::string_view name) const {
    std::vector<Section> found;
    const std::string needle = "[" + std::string(name) + "]";
    // Every header begins with "[" and most printer IDs with the same
    // vendor and product: memmem's skipping search beats trying each "[".
    auto find = [&](size_t from) {
        const void *hit = ::memmem(text_.data() + from, text_.size() - from, needle.data(), needle.size());
        return hit == nullptr ? std::string::npos : static_cast<size_t>(static_cast<const char *>(hit) - text_.data());
    };
    for (size_t pos = find(0); pos != std::string::npos; pos = find(pos + 1)) {
        auto start = LineStartBefore(pos);
        if (!start) continue;
        // "[a]b]" names "a]b": the name runs to the line's last "]".
        auto header = ParseSectionHeader(Line(*start));
        if (!header || *header != name) continue;
        Section s;
        s.header = *start;
        s.body = s.bodyEnd = LineEnd(*start);
        const size_t next = NextHeader(s.body);
        for (size_t at = s.body; at < next; at = LineEnd(at)) {
            if (ParseSectionKeyLine(Line(at))) s.bodyEnd = LineEnd(at);
        }
        found.push_back(s);
        pos = s.body - 1;
    }
    return found;
}

std::vector<std::pair<size_t, KeyValue>> SectionDocument::KeyLines(const std::vector<Section> &found) const {
    std::vector<std::pair<size_t, KeyValue>> keys;
    for (const Section &s : found) {
        for (size_t at = s.body; at < s.bodyEnd; at = LineEnd(at)) {
            if (auto kv = ParseSectionKeyLine(Line(at))) keys.emplace_back(at, *kv);
        }
    }
    return keys;
}

std::string SectionDocument::Appended(std::string_view text) const {
    std::string out;
    out.reserve(text_.size() + 1 + text.size());
    out += text_;
    if (!out.empty() && out.back() != '\n') out.push_back('\n');
    out += text;
    return out;
}

std::string SectionDocument::Replaced(const std::vector<Section> &found, std::string_view replacement) const {
    std::string out;
    out.reserve(text_.size() + replacement.size());
    size_t next = 0;  // the first byte not yet copied
    for (const Section &s : found) {
        out.append(text_, next, s.header - next);
        if (&s == &found.front()) out += replacement;
        next = s.bodyEnd;
    }
    out.append(text_, next);
    return out;
}

std::string SectionDocument::WithLine(size_t at, bool bReplace, std::string_view line) const {
    std::string out;
    out.reserve(text_.size() + 1 + line.size());
    out.append(text_, 0, at);
    if (!out.empty() && out.back() != '\n') out.push_back('\n');
    out += line;
    out.append(text_, bReplace ? LineEnd(at) : at);
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
