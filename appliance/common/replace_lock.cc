#include "common/replace_lock.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <optional>

#include "common/pause.h"
#include "common/temp_files.h"

namespace xavo::platform {
namespace {

constexpr char kLockSuffix[] = ".lock";
constexpr mode_t kLockMode = 0600;
// A planted lock file is swapped out through a private name of this form
// beside it.  It never matches the template of a temporary file, whose six
// random characters follow a ".".
constexpr char kSwapSuffix[] = "~XXXXXX";
// A writer holds the lock for one read and one replace of a small file, a
// few milliseconds.  A killed holder loses it at once (the kernel drops its
// flock); only a stopped or wedged one makes the others wait this long,
// which they then report instead of waiting for ever.
constexpr std::chrono::milliseconds kLockWait{10000};
constexpr long kRetryNs = 2 * 1000 * 1000;
// Each planted lock file found at the name costs one round.
constexpr int kOpenRounds = 4;

std::string LockPathOf(const char *szPath) {
    const std::string path(szPath);
    return DirName(path) + "/." + BaseName(path) + kLockSuffix;
}

// 0600 in a shared directory: anybody who can open a lock file can flock it
// and so keep root's writers out.
bool IsOurLockFile(const struct stat &st, bool bShared) {
    return IsOwnFile(st) && (!bShared || (st.st_mode & 077) == 0);
}

// Errors of opening a name that something other than a lock file holds
// (a link, a socket, another user's file).
bool IsSomethingElse(int error) { return error == ELOOP || error == EACCES || error == EPERM || error == ENXIO; }

// Puts a new lock file at the name of a planted one and removes the planted
// one, without ever removing a good lock file that another writer made
// there meanwhile: the new file is swapped in (RENAME_EXCHANGE) and what
// came out is looked at under the private name; a good lock file goes back.
// The new file stays locked throughout, so that nobody takes it for the
// lock while it may still go.  Its descriptor, in place; -1 with EAGAIN
// when the name is to be looked at again.
int SwapOutPlanted(const std::string &lockPath) {
    std::string swap = lockPath + kSwapSuffix;
    Fd fresh(CreateLockedTemp(&swap));
    if (fresh.get() < 0) return -1;
    if (::renameat2(AT_FDCWD, swap.c_str(), AT_FDCWD, lockPath.c_str(), RENAME_EXCHANGE) != 0) {
        int saved = errno;
        ::unlink(swap.c_str());
        errno = saved == ENOENT ? EAGAIN : saved;  // gone meanwhile: made afresh
        return -1;
    }
    struct stat out {};
    if (::fstatat(AT_FDCWD, swap.c_str(), &out, AT_SYMLINK_NOFOLLOW) == 0 && IsOurLockFile(out, true)) {
        if (::renameat2(AT_FDCWD, swap.c_str(), AT_FDCWD, lockPath.c_str(), RENAME_EXCHANGE) != 0) {
            return fresh.release();  // still in place, and as good a lock file
        }
        ::unlink(swap.c_str());
        errno = EAGAIN;
        return -1;
    }
    if (::unlink(swap.c_str()) != 0 && errno == EISDIR) ::rmdir(swap.c_str());
    return fresh.release();
}

// The lock file at the name, made when missing.  In a shared directory a
// planted one (a link, a FIFO, another user's file, one others may open) is
// replaced; in root's own directories only root can have put it there, and
// it is reported instead.  -1 with errno when none can be had.
int OpenLockFile(const std::string &lockPath, bool bShared) {
    for (int round = 0; round < kOpenRounds; ++round) {
        // O_NONBLOCK: a FIFO planted at the name must not hang the writer.
        Fd fd(::open(lockPath.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
        if (fd.get() < 0 && errno == ENOENT) {
            fd.reset(::open(lockPath.c_str(), O_RDONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC | O_NOCTTY,
                            kLockMode));
            if (fd.get() >= 0) return fd.release();
            if (errno == EEXIST) continue;  // another writer made it first
            return -1;
        }
        struct stat st {};
        if (fd.get() >= 0 && ::fstat(fd.get(), &st) == 0 && IsOurLockFile(st, bShared)) return fd.release();
        if (fd.get() < 0 && !IsSomethingElse(errno)) return -1;
        if (!bShared) {
            errno = EPERM;
            return -1;
        }
        int fresh = SwapOutPlanted(lockPath);
        if (fresh >= 0 || errno != EAGAIN) return fresh;
    }
    errno = EAGAIN;
    return -1;
}

}  // namespace

bool IsSharedDirectory(const std::string &dir) {
    struct stat st {};
    return ::stat(dir.c_str(), &st) == 0 && S_ISDIR(st.st_mode) && (st.st_mode & S_IWOTH) != 0;
}

bool IsTrustedFile(const struct stat &st) {
    return S_ISREG(st.st_mode) && (st.st_uid == 0 || st.st_uid == ::geteuid()) && st.st_nlink == 1 &&
           (st.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool FileWriteLock::Take(const char *szPath, Failure *pFailure) {
    const std::string lockPath = LockPathOf(szPath);
    const bool bShared = IsSharedDirectory(DirName(lockPath));
    // A failure with code 0 once taken.
    const auto settled = RetryWithin(kLockWait, kRetryNs, [&]() -> std::optional<Failure> {
        Fd fd(OpenLockFile(lockPath, bShared));
        if (fd.get() < 0) return Failure{kErrOpen, __LINE__};
        // Locked, the file must still be the one at the name: a planted one
        // swapped out meanwhile is nobody's lock any more.
        if (TryLock(fd.get(), true)) {
            if (!StillNamed(fd.get(), lockPath)) return std::nullopt;
            fd_.reset(fd.release());
            return Failure{};
        }
        if (errno == EWOULDBLOCK) return std::nullopt;
        return Failure{kErrLock, __LINE__};
    });
    const Failure failure = settled.value_or(Failure{kErrLock, __LINE__});
    if (failure.code == 0) return true;
    *pFailure = failure;
    return false;
}

}  // namespace xavo::platform
