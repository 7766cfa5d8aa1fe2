#include "common/text_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "common/fd.h"
#include "common/replace_lock.h"
#include "common/temp_files.h"

namespace xavo::platform {
namespace {

// The appliance's files are a few kilobytes; anything this large is not one
// of them, and reading it whole would only exhaust a small appliance.
constexpr off_t kMaxFileSize = 16 * 1024 * 1024;
constexpr mode_t kNewFileMode = 0644;

// The temporary file of a replacement, removed unless it was renamed into
// place.
class TempFile {
public:
    explicit TempFile(std::string name) : name_(std::move(name)) {}
    TempFile(const TempFile &) = delete;
    TempFile &operator=(const TempFile &) = delete;
    ~TempFile() {
        if (!committed_) {
            int saved = errno;
            ::unlink(name_.c_str());
            errno = saved;
        }
    }
    const char *name() const { return name_.c_str(); }
    void Commit() { committed_ = true; }

private:
    std::string name_;
    bool committed_ = false;
};

// Whether a file that fails the trust of a shared directory is in one: it
// is then ignored by readers and replaced by writers.  The directory is
// looked at only for such files, so root's ordinary files cost nothing.
bool Untrusted(const char *szPath, const struct stat &st) {
    return !IsTrustedFile(st) && IsSharedDirectory(DirName(szPath));
}

// The file that a replacement takes the place of.  *pbKeep: its mode and
// owner go to the new file.  False, with the failure, when the path must
// not be replaced.
bool ExistingFile(const char *szPath, struct stat *pOld, bool *pbKeep, Failure *pFailure) {
    *pbKeep = false;
    if (::lstat(szPath, pOld) != 0) {
        if (errno == ENOENT) return true;
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    // In a shared directory (/tmp) anybody may have put a file, a link or a
    // FIFO at the path before root wrote it: it is not root's, and root's
    // new file takes its place, owned by root with the appliance's mode.
    // rename() replaces whatever is at the path without following it.
    if (Untrusted(szPath, *pOld)) return true;
    // Elsewhere a link is refused rather than replaced: in root's own
    // directories it is an administrator's deliberate arrangement, not to
    // be silently broken or followed by a root process.
    if (!S_ISREG(pOld->st_mode)) {
        errno = S_ISLNK(pOld->st_mode) ? ELOOP : EINVAL;
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    *pbKeep = true;
    return true;
}

// Reads to the end into one block of the size fstat gave (plus the byte
// that shows the end), so that a large file costs one read, not a read and
// a reallocation per chunk; a file that grew meanwhile is still read whole.
bool ReadWhole(int fd, size_t sizeHint, std::string *pText) {
    // Files of /proc and /sys tell a size of 0.
    constexpr size_t kMinBlock = 512;
    std::string text(std::max(sizeHint + 1, kMinBlock), '\0');
    size_t got = 0;
    for (;;) {
        if (got == text.size()) text.resize(std::min(2 * text.size(), static_cast<size_t>(kMaxFileSize) + 1));
        ssize_t n = ::read(fd, text.data() + got, text.size() - got);
        if (n < 0) {
            if (errno == EINTR) continue;
            return false;
        }
        if (n == 0) break;
        got += static_cast<size_t>(n);
        if (got > static_cast<size_t>(kMaxFileSize)) {
            errno = EFBIG;
            return false;
        }
    }
    text.resize(got);
    *pText = std::move(text);
    return true;
}

}  // namespace

bool WriteAll(int fd, std::string_view data) {
    while (!data.empty()) {
        ssize_t n = ::write(fd, data.data(), data.size());
        if (n < 0) {
            if (errno == EINTR) continue;
            return false;
        }
        data.remove_prefix(static_cast<size_t>(n));
    }
    return true;
}

ReadResult ReadTextFile(const char *szPath, std::string *pText) {
    // O_NONBLOCK: a FIFO planted at the path must not hang the reader; it is
    // refused below like any other non-regular file.
    Fd fd(::open(szPath, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    if (fd.get() < 0 && errno == ELOOP && IsSharedDirectory(DirName(szPath))) return ReadResult::kMissing;
    if (fd.get() < 0) return errno == ENOENT ? ReadResult::kMissing : ReadResult::kFailed;
    struct stat st {};
    if (::fstat(fd.get(), &st) != 0) return ReadResult::kFailed;
    // Every file the platform reads in a shared directory ("/tmp/usbtab",
    // "/tmp/usbip_*") is written by root's services; one that is not
    // root's is somebody else's plant and reads as missing, for the readers
    // of the tables (the USB library's listing, ORLICFileGetKeyValue,
    // ORLICFileGetPair, the section readers) and for the writers, which
    // then replace it.
    if (Untrusted(szPath, st)) return ReadResult::kMissing;
    if (!S_ISREG(st.st_mode) || st.st_size > kMaxFileSize) {
        errno = S_ISREG(st.st_mode) ? EFBIG : EINVAL;
        return ReadResult::kFailed;
    }
    std::string text;
    if (!ReadWhole(fd.get(), static_cast<size_t>(st.st_size), &text)) return ReadResult::kFailed;
    *pText = std::move(text);
    return ReadResult::kOk;
}

bool ReplaceFile(const char *szPath, std::string_view content, Failure *pFailure) {
    const std::string path(szPath);
    struct stat old {};
    bool bKeep = false;
    if (!ExistingFile(szPath, &old, &bKeep, pFailure)) return false;

    // Same directory, so that the rename stays within one file system and
    // is atomic; hidden, so that directory listings do not pick it up.
    // Writers hold the file's write lock (replace_lock.h), and every
    // temporary file is locked by its writer until its rename: one of this
    // file's that nobody holds was left by a writer killed before its
    // rename, and goes now.  So at most one (the last killed writer's) is
    // ever left.
    std::string tmpl = DirName(path) + "/." + BaseName(path) + ".XXXXXX";
    RemoveStaleTemps(tmpl);
    Fd fd(CreateLockedTemp(&tmpl));
    if (fd.get() < 0) {
        *pFailure = {kErrOpen, __LINE__};
        return false;
    }
    TempFile temp(tmpl);  // removed, while still locked, unless renamed

    if (!WriteAll(fd.get(), content)) {
        *pFailure = {kErrWrite, __LINE__};
        return false;
    }
    // The temporary file is 0600; the replacement takes the old file's
    // mode (Samba and CUPS read some of these files as other users).
    if (::fchmod(fd.get(), bKeep ? (old.st_mode & 07777) : kNewFileMode) != 0) {
        *pFailure = {kErrWrite, __LINE__};
        return false;
    }
    if (bKeep && (old.st_uid != ::geteuid() || old.st_gid != ::getegid()) &&
        ::fchown(fd.get(), old.st_uid, old.st_gid) != 0 && errno != EPERM) {
        *pFailure = {kErrWrite, __LINE__};
        return false;
    }
    // The data must be on disk before the rename makes it the file, or a
    // power cut could leave an empty file under the real name.
    if (::fsync(fd.get()) != 0) {
        *pFailure = {kErrWrite, __LINE__};
        return false;
    }
    if (::rename(temp.name(), szPath) != 0) {
        *pFailure = {kErrRename, __LINE__};
        return false;
    }
    temp.Commit();
    // Make the rename itself durable; the new content is in place already,
    // so a failure here is not reported.
    Fd dir(::open(DirName(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (dir.get() >= 0) ::fsync(dir.get());
    return true;
}

bool LoadTextFile(const char *szPath, bool bMissingIsEmpty, std::string *pText, const char *szUnit, int iLine) {
    ReadResult result = ReadTextFile(szPath, pText);
    if (result == ReadResult::kMissing && bMissingIsEmpty) {
        pText->clear();
        return true;
    }
    if (result == ReadResult::kOk) return true;
    SetError(kErrOpen, szUnit, iLine);
    return false;
}

bool StoreTextFile(const char *szPath, std::string_view text, const char *szUnit) {
    Failure failure;
    if (ReplaceFile(szPath, text, &failure)) return true;
    SetError(failure.code, szUnit, failure.line);
    return false;
}

}  // namespace xavo::platform
