#include "common/temp_files.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <string_view>

#include "common/fd.h"

namespace xavo::platform {
namespace {

constexpr char kXs[] = "XXXXXX";
constexpr size_t kXCount = sizeof kXs - 1;
constexpr char kNameChars[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789";
constexpr size_t kNameCharCount = sizeof kNameChars - 1;
constexpr mode_t kTempMode = 0600;
// Names tried before giving up; each is one of 62^6, so only a directory
// full of planted names, or sweeps taking every new file, run out of them.
constexpr int kNameTries = 64;

bool EndsWithXs(std::string_view path) {
    return path.size() >= kXCount && path.substr(path.size() - kXCount) == kXs;
}

bool IsNameChar(char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9'); }

bool RandomName(char *pXs) {
    unsigned char bytes[kXCount];
    ssize_t n;
    do {
        n = ::getrandom(bytes, sizeof bytes, 0);
    } while (n < 0 && errno == EINTR);
    if (n != static_cast<ssize_t>(sizeof bytes)) return false;
    for (size_t i = 0; i < kXCount; ++i) pXs[i] = kNameChars[bytes[i] % kNameCharCount];
    return true;
}

// Whether the name is the template's prefix and six letters and digits.
bool IsTempOf(std::string_view name, std::string_view prefix) {
    if (name.size() != prefix.size() + kXCount || name.substr(0, prefix.size()) != prefix) return false;
    for (char c : name.substr(prefix.size())) {
        if (!IsNameChar(c)) return false;
    }
    return true;
}

void RemoveIfStale(int dirFd, const char *szName) {
    // O_NONBLOCK: a FIFO planted under such a name must not hang the sweep.
    Fd fd(::openat(dirFd, szName, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (fd.get() < 0) return;
    struct stat st {};
    if (::fstat(fd.get(), &st) != 0 || !IsOwnFile(st)) return;
    if (!TryLock(fd.get(), true)) return;  // a live writer's
    // The name must still be the file examined: only a locked file is ever
    // removed, never whatever took its name meanwhile.
    struct stat now {};
    if (::fstatat(dirFd, szName, &now, AT_SYMLINK_NOFOLLOW) != 0 || now.st_dev != st.st_dev ||
        now.st_ino != st.st_ino) {
        return;
    }
    ::unlinkat(dirFd, szName, 0);
}

struct DirCloser {
    void operator()(DIR *d) const { ::closedir(d); }
};

}  // namespace

bool IsOwnFile(const struct stat &st) {
    return S_ISREG(st.st_mode) && st.st_uid == ::geteuid() && st.st_nlink == 1;
}

bool TryLock(int fd, bool bExclusive) {
    int r;
    do {
        r = ::flock(fd, (bExclusive ? LOCK_EX : LOCK_SH) | LOCK_NB);
    } while (r != 0 && errno == EINTR);
    return r == 0;
}

std::string DirName(const std::string &path) {
    size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    if (slash == 0) return "/";
    return path.substr(0, slash);
}

std::string BaseName(const std::string &path) {
    size_t slash = path.rfind('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

bool StillNamed(int fd, const std::string &path) {
    struct stat held {}, named {};
    return ::fstat(fd, &held) == 0 && ::lstat(path.c_str(), &named) == 0 && held.st_dev == named.st_dev &&
           held.st_ino == named.st_ino;
}

int CreateLockedTemp(std::string *pTemplate) {
    std::string &name = *pTemplate;
    if (!EndsWithXs(name)) {
        errno = EINVAL;
        return -1;
    }
    for (int i = 0; i < kNameTries; ++i) {
        if (!RandomName(&name[name.size() - kXCount])) return -1;
        Fd fd(::open(name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC | O_NOCTTY, kTempMode));
        if (fd.get() < 0) {
            if (errno == EEXIST) continue;
            return -1;
        }
        // Between the open and the lock, a sweep of the template may take
        // the new file for a killed writer's: it then holds the lock, or
        // has removed the name.  Such a file is left to the sweep, and the
        // writer makes another.
        if (TryLock(fd.get(), true) && StillNamed(fd.get(), name)) return fd.release();
    }
    errno = EEXIST;
    return -1;
}

void RemoveStaleTemps(const std::string &tmpl) {
    if (!EndsWithXs(tmpl)) return;
    const int saved = errno;
    std::string prefix = BaseName(tmpl);
    prefix.resize(prefix.size() - kXCount);
    Fd dirFd(::open(DirName(tmpl).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    std::unique_ptr<DIR, DirCloser> dir(dirFd.get() >= 0 ? ::fdopendir(dirFd.get()) : nullptr);
    if (dir) {
        dirFd.release();  // the stream owns it now
        while (const dirent *entry = ::readdir(dir.get())) {
            if (IsTempOf(entry->d_name, prefix)) RemoveIfStale(::dirfd(dir.get()), entry->d_name);
        }
    }
    errno = saved;
}

}  // namespace xavo::platform
