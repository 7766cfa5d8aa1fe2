// Linked into every fuzz target.
//
// The library logs through syslog(3); a fuzz target runs on the developer's
// machine, outside the sandbox, and millions of runs must not reach the
// host's log.  Defined here, in the executable, these take the place of the
// C library's for every part of the process.
#include <cstdarg>

extern "C" {
void syslog(int, const char *, ...) {}
void vsyslog(int, const char *, va_list) {}
void __syslog_chk(int, int, const char *, ...) {}
void __vsyslog_chk(int, int, const char *, va_list) {}
void openlog(const char *, int, int) {}
void closelog() {}
}
