// Temporary files that take a file's place by rename, and the litter that
// writers killed before their rename leave behind.
//
// Every such temporary file is locked (flock, exclusive) by its writer from
// its making until the writer closes it, which it does only after the
// rename.  A temporary file of a template that nobody holds a lock on
// therefore belongs to a writer that is gone (the kernel dropped the lock
// with the killed writer's descriptors), or to one that has just made it
// and not locked it yet: such a writer finds, once it holds the lock, that
// its file lost its name, and makes another.  The rule needs no lock of its
// own, so it serves the writers that replace a file without one (the CUPS
// printers.conf edit) as well as those that hold the file's write lock.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <string>

namespace xavo::platform {

// Creates a new file from *pTemplate, a path ending in "XXXXXX" whose X's
// are replaced by six random letters and digits, open for writing
// (close-on-exec), mode 0600 and locked.  The descriptor, or -1 with errno
// set.
int CreateLockedTemp(std::string *pTemplate);

// Removes the files of the template (the same directory, the same name with
// any six letters and digits for the X's) that no live writer holds: plain
// files of this user, with one link, whose lock can be taken.  Files of
// other users, links and anything else are never touched.  Best effort: a
// file that cannot be examined stays.
void RemoveStaleTemps(const std::string &tmpl);

// A plain file of this process's user with one link, as its writers make
// their temporary and lock files.
bool IsOwnFile(const struct stat &st);

// One attempt at an exclusive (or shared) flock, not waiting for a holder;
// false with errno set (EWOULDBLOCK: held elsewhere).
bool TryLock(int fd, bool bExclusive);
// Whether the path still names the open file (a link at it does not).
bool StillNamed(int fd, const std::string &path);

// The directory part and the last component of a path.
std::string DirName(const std::string &path);
std::string BaseName(const std::string &path);

}  // namespace xavo::platform
