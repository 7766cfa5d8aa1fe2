// Files and locks: existence, temporary files, lock files, and the
// appliance-wide named locks.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <map>
#include <mutex>
#include <optional>
#include <string>

#include "common/appliance.h"
#include "common/fd.h"
#include "common/pause.h"
#include "common/temp_files.h"
#include "core/fork_local.h"
#include "core/internal.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "file_lock";

constexpr mode_t kLockDirMode = 0755;
constexpr mode_t kLockFileMode = 0644;

// ORLICFileLockByFile's flag word: bit 0 asks for an exclusive lock, else a
// shared one.  Attempts never block; the caller retries.
constexpr int32_t kLockByFileExclusive = 0x1;

// ORLICFileLock's first argument: the lock's identifier in the high 16
// bits, flock(2) operation bits in the low ones (0x20006 is LOCK_USBIDMAP
// with LOCK_EX | LOCK_NB).  LOCK_SH alone asks for a shared lock, anything
// else for an exclusive one.  The second argument is how many seconds
// attempts are repeated while another process holds the lock (0: a single
// attempt).  The platform never waits without a bound, so LOCK_NB changes
// nothing: every attempt is non-blocking and the timeout bounds them all.
constexpr uint32_t kLockIdMask = 0xFFFF0000u;
constexpr uint32_t kLockOpShared = 0x1;  // LOCK_SH
constexpr uint32_t kLockOpExclusive = 0x2;  // LOCK_EX
constexpr long kLockRetryNs = 20 * 1000 * 1000;

struct NamedLock {
    uint32_t id;
    const char *path;
};
// Under /run: gone with every restart, like the locks' holders.
constexpr NamedLock kNamedLocks[] = {
    {ORLIC_LOCK_USBIDMAP, "/run/xavosdk/lock/LOCK_USBIDMAP"},
};

// Named locks this process holds, by identifier: the descriptor that holds a
// lock must stay open between ORLICFileLock and ORLICFileUnlock, and the
// caller gets no handle for it.  A child forked by the host does not hold
// the locks of its parent: it forgets them (closing its copies of the
// descriptors, which leaves the parent's locks in place) instead of
// believing it holds them.
void ForgetLock(std::pair<const uint32_t, int> &entry) { ::close(entry.second); }
using HeldLocks = xavo::core::ForkLocal<std::map<uint32_t, int>, ForgetLock>;
[[maybe_unused]] const bool kForkHandlers = (HeldLocks::Get(), true);

// mkdir -p of the lock file's directory.
bool MakeParentDirs(const std::string &path) {
    for (size_t slash = path.find('/', 1); slash != std::string::npos; slash = path.find('/', slash + 1)) {
        std::string dir = path.substr(0, slash);
        if (::mkdir(dir.c_str(), kLockDirMode) != 0 && errno != EEXIST) return false;
    }
    return true;
}

// One non-blocking attempt: the locked descriptor, -1 when the lock is held
// elsewhere (errno EWOULDBLOCK), -2 when the lock file cannot be opened.
int TryLockFile(const char *szPath, bool bExclusive) {
    // O_NOFOLLOW: /run is the appliance's, but a lock file is never worth
    // following a link for.  Read-only is enough for flock().  The
    // directories are made only when missing (after a restart): the lock is
    // taken around every write of the printer configuration.
    constexpr int kFlags = O_RDONLY | O_CREAT | O_NOFOLLOW | O_CLOEXEC | O_NOCTTY;
    Fd fd(::open(szPath, kFlags, kLockFileMode));
    if (fd.get() < 0 && errno == ENOENT && MakeParentDirs(szPath)) fd.reset(::open(szPath, kFlags, kLockFileMode));
    if (fd.get() < 0) return -2;
    if (!TryLock(fd.get(), bExclusive)) return errno == EWOULDBLOCK ? -1 : -2;
    return fd.release();
}

}  // namespace

XAVO_PLATFORM_API int32_t ORLICFileExist(const char *szPath) {
    Counted(__func__);
    struct stat st {};
    return szPath != nullptr && ::stat(szPath, &st) == 0 ? 1 : 0;
}

XAVO_PLATFORM_API FILE *ORLICFileTempFileOpen(char *szTemplate) {
    if (XAVO_INJECTED()) return nullptr;
    constexpr char kSuffix[] = "XXXXXX";
    size_t len = szTemplate != nullptr ? std::strlen(szTemplate) : 0;
    if (len < sizeof kSuffix - 1 || std::strcmp(szTemplate + len - (sizeof kSuffix - 1), kSuffix) != 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return nullptr;
    }
    // 0600, as mkstemp makes it; close-on-exec, so that programs the caller
    // starts meanwhile do not hold the file open.  The file stays locked
    // while the stream is open, which tells other writers of the template
    // that it is being filled: the caller renames it into place before it
    // closes the stream.  Those of the template that nobody holds were left
    // by writers killed before their rename, and go first.
    return XAVO_GUARD(static_cast<FILE *>(nullptr), [&]() -> FILE * {
        std::string name(szTemplate);
        RemoveStaleTemps(name);
        int fd = CreateLockedTemp(&name);
        if (fd < 0) {
            SetError(kErrOpen, kUnit, __LINE__);
            return nullptr;
        }
        std::memcpy(szTemplate, name.data(), len);
        FILE *pFile = ::fdopen(fd, "w");
        if (pFile == nullptr) {
            int saved = errno;
            ::unlink(szTemplate);
            ::close(fd);
            errno = saved;
            SetError(kErrOpen, kUnit, __LINE__);
        }
        return pFile;
    });
}

// 1 with *pfdLock set when the lock was taken; 0 when another holder has it
// (the caller may try again at once); -1 when the lock file cannot be used.
XAVO_PLATFORM_API int32_t ORLICFileLockByFile(const char *szPath, int32_t iFlags, int32_t *pfdLock) {
    if (XAVO_INJECTED()) return -1;
    if (szPath == nullptr || szPath[0] != '/' || pfdLock == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    int fd = TryLockFile(szPath, (iFlags & kLockByFileExclusive) != 0);
    if (fd == -1) {
        SetError(kErrLock, kUnit, __LINE__);
        return 0;
    }
    if (fd < 0) {
        SetError(kErrOpen, kUnit, __LINE__);
        return -1;
    }
    *pfdLock = fd;
    return 1;
}

XAVO_PLATFORM_API int32_t ORLICFileLock(uint32_t uLockAndFlags, int32_t iTimeout) {
    if (XAVO_INJECTED()) return -1;
    uint32_t id = uLockAndFlags & kLockIdMask;
    const NamedLock *lock = nullptr;
    for (const NamedLock &l : kNamedLocks) {
        if (l.id == id) lock = &l;
    }
    if (lock == nullptr || iTimeout < 0) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    uint32_t op = uLockAndFlags & ~kLockIdMask;
    bool bExclusive = (op & kLockOpExclusive) != 0 || (op & kLockOpShared) == 0;
    return XAVO_GUARD(int32_t{-1}, [&] {
        HeldLocks &held = HeldLocks::Get();
        // 0 once taken, ERR_OPEN when the lock file cannot be used.
        const auto attempt = [&]() -> std::optional<uint32_t> {
            // Another thread of this process holding the lock is busy like
            // another process.  The table's slot is made before the
            // attempt, so that a lock taken is never lost to a failed
            // allocation.
            std::lock_guard guard(held.mutex);
            auto [slot, bFree] = held.table.try_emplace(id, -1);
            if (!bFree) return std::nullopt;
            int fd = TryLockFile(lock->path, bExclusive);
            if (fd >= 0) {
                slot->second = fd;
                return uint32_t{0};
            }
            held.table.erase(slot);
            if (fd == -2) return kErrOpen;
            return std::nullopt;
        };
        const uint32_t uCode = RetryWithin(std::chrono::seconds(iTimeout), kLockRetryNs, attempt).value_or(kErrLock);
        if (uCode == 0) return int32_t{0};
        SetError(uCode, kUnit, __LINE__);
        return int32_t{-1};
    });
}

namespace xavo::core {
void ReleaseNamedLocks() {
    HeldLocks &held = HeldLocks::Get();
    std::lock_guard guard(held.mutex);
    held.ForgetAll();
}
}  // namespace xavo::core

// An unlock that a test makes fail still releases the lock: the failure is
// only reported, so that it does not hold the lock into the next test.
XAVO_PLATFORM_API int32_t ORLICFileUnlock(uint32_t uLock) {
    uint32_t uInjected = 0;
    bool bInjected = XavoStandinEnter(__func__, 1, &uInjected) != 0;
    HeldLocks &held = HeldLocks::Get();
    std::lock_guard guard(held.mutex);
    auto it = held.table.find(uLock & kLockIdMask);
    if (it == held.table.end()) {
        SetError(kErrUnlock, kUnit, __LINE__);
        return -1;
    }
    // Closing the only descriptor of the lock file releases the lock, even
    // when close() reports an error.
    int fd = it->second;
    held.table.erase(it);
    if (::close(fd) != 0 && errno != EINTR) {
        SetError(kErrUnlock, kUnit, __LINE__);
        return -1;
    }
    if (bInjected) {
        SetError(uInjected, kUnit, __LINE__);
        return -1;
    }
    return 0;
}
