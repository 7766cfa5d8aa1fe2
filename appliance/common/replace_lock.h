// The write lock of one file, and the trust that root's writers and readers
// give files in directories that other users can write to.
//
// The stand-ins' writers of section and key-value files read the whole
// file, change it and replace it.  Two processes doing that at once would
// each replace the file with their own change only, losing the other's
// (the network printer table lost half its lines that way).  So every such
// read-change-replace holds the file's write lock: an exclusive flock on a
// lock file beside it, "." + name + ".lock", mode 0600.  Readers take no
// lock; the replacement is atomic, so they see the old or the new file.
#pragma once

#include <sys/stat.h>

#include <string>
#include <utility>

#include "common/appliance.h"
#include "common/fd.h"

namespace xavo::platform {

// A directory where users other than root can make and remove names (it is
// writable by others; /tmp is one, sticky).  Follows a link to the
// directory.
bool IsSharedDirectory(const std::string &dir);

// Whether a file met in a shared directory can be root's: a plain file,
// owned by root or by this process's user, with one link, that nobody
// else may write to.  Anything else there was planted or tampered with.
bool IsTrustedFile(const struct stat &st);

class FileWriteLock {
public:
    // Takes the lock of szPath's writers, waiting a bounded time for its
    // holder; false with *pFailure (ERR_LOCK when still held, ERR_OPEN when
    // the lock file cannot be used).
    bool Take(const char *szPath, Failure *pFailure);

private:
    Fd fd_;
};

// Guard() for an operation that rewrites szPath: body runs holding the
// file's write lock; a lock that cannot be taken is the operation's
// failure, reported under its unit.
template <class R, class F>
R GuardWrite(const char *szUnit, int iLine, const char *szPath, R failure, F &&body) noexcept {
    return Guard(szUnit, iLine, failure, [&] {
        FileWriteLock lock;
        Failure why;
        if (!lock.Take(szPath, &why)) {
            SetError(why.code, szUnit, why.line);
            return failure;
        }
        return std::forward<F>(body)();
    });
}

}  // namespace xavo::platform

#define XAVO_GUARD_WRITE(path, failure, ...) \
    ::xavo::platform::GuardWrite(kUnit, __LINE__, (path), (failure), __VA_ARGS__)
