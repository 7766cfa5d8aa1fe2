// The sandbox's replacements of sleep(), usleep(), the open() family and
// ioctl().  Linked into every test executable, which is linked with
// -rdynamic: the dynamic linker then binds the calls of the library and of
// the platform stand-ins to these definitions before libc's.  The same
// files (this one, shared_state.cc and usblp_node.cc) are built as the
// preloadable xavo_usblp_preload, for programs that run outside a test
// executable but inside a sandbox.
//
// Only calls made through the PLT are seen.  libc's own internal opens
// (fopen, std::ifstream, opendir) bypass the open() symbol, so a simulated
// device must be opened with open()/openat(), as the usblp code does.
//
// Outside a sandbox (no state file) every call goes straight to libc.

// The fortified inline wrappers of <fcntl.h> would collide with the
// definitions below.
#undef _FORTIFY_SOURCE

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/ioctl.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdarg>

#include "sandbox/shared_state.h"
#include "sandbox/usblp_node.h"

extern "C" {
int __open_2(const char *path, int flags);
int __open64_2(const char *path, int flags);
int __openat_2(int dirfd, const char *path, int flags);
int __openat64_2(int dirfd, const char *path, int flags);
}

namespace xavo::test::detail {
namespace {

// ---- the real functions --------------------------------------------------
// dlsym(RTLD_NEXT) finds what would have been called without us (libc, or a
// sanitizer's interceptor in front of it).  When it cannot answer, the
// system call is made directly.
template <class Fn>
Fn Next(const char *name, std::atomic<void *> &cache) {
    void *p = cache.load(std::memory_order_relaxed);
    if (p == nullptr) {
        p = dlsym(RTLD_NEXT, name);
        cache.store(p, std::memory_order_relaxed);
    }
    return reinterpret_cast<Fn>(p);
}

using OpenFn = int (*)(const char *, int, ...);
using OpenAtFn = int (*)(int, const char *, int, ...);
using Open2Fn = int (*)(const char *, int);
using OpenAt2Fn = int (*)(int, const char *, int);
using IoctlFn = int (*)(int, unsigned long, ...);

std::atomic<void *> g_open, g_open64, g_openat, g_openat64, g_open2, g_open642, g_openat2,
    g_openat642, g_ioctl;

int RealOpenAt(const char *name, std::atomic<void *> &cache, int dirfd, const char *path, int flags,
               mode_t mode) {
    if (auto fn = Next<OpenAtFn>(name, cache)) return fn(dirfd, path, flags, mode);
    return static_cast<int>(syscall(SYS_openat, dirfd, path, flags, mode));
}
int RealOpen(const char *name, std::atomic<void *> &cache, const char *path, int flags, mode_t mode) {
    if (auto fn = Next<OpenFn>(name, cache)) return fn(path, flags, mode);
    return static_cast<int>(syscall(SYS_openat, AT_FDCWD, path, flags, mode));
}
int RealIoctl(int fd, unsigned long request, void *arg) {
    if (auto fn = Next<IoctlFn>("ioctl", g_ioctl)) return fn(fd, request, arg);
    return static_cast<int>(syscall(SYS_ioctl, fd, request, arg));
}

// ---- counted sleeps ------------------------------------------------------
void RecordSleep(SharedState *s, std::uint64_t us) {
    const std::uint32_t i = s->sleepCount.fetch_add(1, std::memory_order_acq_rel);
    if (i < kMaxSleeps) s->sleeps[i].store(us, std::memory_order_release);
}

// Waits for real.  clock_nanosleep is left alone by the sandbox, so this is
// the same wait the libc functions would make.  Returns the microseconds
// left when a signal cut the wait short, else 0.
std::uint64_t Wait(std::uint64_t us) {
    timespec ts{static_cast<time_t>(us / 1000000), static_cast<long>(us % 1000000) * 1000};
    timespec rem{};
    if (clock_nanosleep(CLOCK_MONOTONIC, 0, &ts, &rem) == EINTR) {
        return static_cast<std::uint64_t>(rem.tv_sec) * 1000000 + static_cast<std::uint64_t>(rem.tv_nsec + 999) / 1000;
    }
    return 0;
}

bool CountOnly(std::uint64_t us) {
    SharedState *s = State();
    if (s == nullptr) return false;
    RecordSleep(s, us);
    return s->realSleep.load(std::memory_order_acquire) == 0;
}

mode_t ModeArg(int flags, va_list ap) {
    if ((flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE) return static_cast<mode_t>(va_arg(ap, int));
    return 0;
}

int OpenCommon(const char *fnName, std::atomic<void *> &cache, const char *path, int flags, mode_t mode) {
    if (const char *name = DeviceName(path)) {
        if (SharedState *s = State()) {
            return OpenDevice(s, name, flags, [&](int f) { return RealOpen(fnName, cache, path, f, 0); });
        }
    }
    return RealOpen(fnName, cache, path, flags, mode);
}

int OpenAtCommon(const char *fnName, std::atomic<void *> &cache, int dirfd, const char *path, int flags,
                 mode_t mode) {
    if (const char *name = DeviceName(path)) {
        if (SharedState *s = State()) {
            return OpenDevice(s, name, flags,
                              [&](int f) { return RealOpenAt(fnName, cache, dirfd, path, f, 0); });
        }
    }
    return RealOpenAt(fnName, cache, dirfd, path, flags, mode);
}

// The fortified entry points take no mode; a call that needs one never
// reaches them (the inline wrapper refuses it at compile time).
int Open2Common(const char *fnName, std::atomic<void *> &cache, const char *path, int flags) {
    if (const char *name = DeviceName(path)) {
        if (SharedState *s = State()) {
            return OpenDevice(s, name, flags, [&](int f) { return RealOpen("open", g_open, path, f, 0); });
        }
    }
    if (auto fn = Next<Open2Fn>(fnName, cache)) return fn(path, flags);
    return RealOpen("open", g_open, path, flags, 0);
}

int OpenAt2Common(const char *fnName, std::atomic<void *> &cache, int dirfd, const char *path, int flags) {
    if (const char *name = DeviceName(path)) {
        if (SharedState *s = State()) {
            return OpenDevice(s, name, flags,
                              [&](int f) { return RealOpenAt("openat", g_openat, dirfd, path, f, 0); });
        }
    }
    if (auto fn = Next<OpenAt2Fn>(fnName, cache)) return fn(dirfd, path, flags);
    return RealOpenAt("openat", g_openat, dirfd, path, flags, 0);
}

}  // namespace

}  // namespace xavo::test::detail

using namespace xavo::test::detail;

extern "C" {

unsigned int sleep(unsigned int seconds) {
    const std::uint64_t us = static_cast<std::uint64_t>(seconds) * 1000000;
    if (CountOnly(us)) return 0;
    return static_cast<unsigned int>((Wait(us) + 999999) / 1000000);
}

int usleep(useconds_t usec) {
    if (CountOnly(usec)) return 0;
    if (Wait(usec) != 0) {
        errno = EINTR;
        return -1;
    }
    return 0;
}

int open(const char *path, int flags, ...) {
    va_list ap;
    va_start(ap, flags);
    const mode_t mode = ModeArg(flags, ap);
    va_end(ap);
    return OpenCommon("open", g_open, path, flags, mode);
}

int open64(const char *path, int flags, ...) {
    va_list ap;
    va_start(ap, flags);
    const mode_t mode = ModeArg(flags, ap);
    va_end(ap);
    return OpenCommon("open64", g_open64, path, flags, mode);
}

int openat(int dirfd, const char *path, int flags, ...) {
    va_list ap;
    va_start(ap, flags);
    const mode_t mode = ModeArg(flags, ap);
    va_end(ap);
    return OpenAtCommon("openat", g_openat, dirfd, path, flags, mode);
}

int openat64(int dirfd, const char *path, int flags, ...) {
    va_list ap;
    va_start(ap, flags);
    const mode_t mode = ModeArg(flags, ap);
    va_end(ap);
    return OpenAtCommon("openat64", g_openat64, dirfd, path, flags, mode);
}

int __open_2(const char *path, int flags) { return Open2Common("__open_2", g_open2, path, flags); }
int __open64_2(const char *path, int flags) { return Open2Common("__open64_2", g_open642, path, flags); }
int __openat_2(int dirfd, const char *path, int flags) {
    return OpenAt2Common("__openat_2", g_openat2, dirfd, path, flags);
}
int __openat64_2(int dirfd, const char *path, int flags) {
    return OpenAt2Common("__openat64_2", g_openat642, dirfd, path, flags);
}

int ioctl(int fd, unsigned long request, ...) noexcept {
    va_list ap;
    va_start(ap, request);
    void *arg = va_arg(ap, void *);
    va_end(ap);
    // A simulated device was opened through State(), so the mapping exists
    // whenever a descriptor can be one of ours.
    if (SharedState *s = MappedState()) {
        if (DeviceSlot *d = SlotOfDescriptor(s, fd)) return DeviceIoctl(d, request, arg);
    }
    return RealIoctl(fd, request, arg);
}

}  // extern "C"
