/* Calls open(), ioctl() and the sleeps from a shared object of its own,
 * built apart from the sandbox, the way the library and the platform
 * libraries reach them: through the dynamic linker.  The sandbox's own test
 * uses it to prove that the interposers catch such calls.  Built fortified,
 * so that open() with flags the compiler cannot see goes through
 * __open_2(), and open() with a mode straight to open(). */
#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

int XavoProbeOpen(const char *path, int flags) { return open(path, flags); }
int XavoProbeOpenMode(const char *path, int flags, mode_t mode) { return open(path, flags, mode); }
int XavoProbeOpenAt(const char *path, int flags) { return openat(AT_FDCWD, path, flags); }
int XavoProbeIoctl(int fd, unsigned long request, void *arg) { return ioctl(fd, request, arg); }
unsigned int XavoProbeSleep(unsigned int seconds) { return sleep(seconds); }
int XavoProbeUsleep(unsigned int usec) { return usleep(usec); }
