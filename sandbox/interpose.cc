// The sandbox's replacements of sleep(), usleep(), the open() family and
// ioctl().  Linked into every test executable, which is linked with
// -rdynamic: the dynamic linker then binds the calls of the library and of
// the platform stand-ins to these definitions before libc's.  The same file
// is built as the preloadable xavo_usblp_preload, for programs that run
// outside a test executable but inside a sandbox.
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
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstring>

#include "sandbox/shared_state.h"

extern "C" {
int __open_2(const char *path, int flags);
int __open64_2(const char *path, int flags);
int __openat_2(int dirfd, const char *path, int flags);
int __openat64_2(int dirfd, const char *path, int flags);
}

namespace xavo::test::detail {
namespace {

std::atomic<SharedState *> g_state{nullptr};

// Raw system calls for the sandbox's own file work: they can never come
// back into the interposers, whatever the loading order.
int RawOpen(const char *path, int flags, mode_t mode = 0) {
    return static_cast<int>(syscall(SYS_openat, AT_FDCWD, path, flags, mode));
}
void RawClose(int fd) { syscall(SYS_close, fd); }

SharedState *MapStateFile() {
    const int fd = RawOpen(kStatePath, O_RDWR | O_CLOEXEC);
    if (fd < 0) return nullptr;
    struct stat st {};
    void *p = MAP_FAILED;
    if (fstat(fd, &st) == 0 && static_cast<std::size_t>(st.st_size) >= sizeof(SharedState)) {
        p = mmap(nullptr, sizeof(SharedState), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    }
    RawClose(fd);
    if (p == MAP_FAILED) return nullptr;
    auto *s = static_cast<SharedState *>(p);
    if (s->magic != kStateMagic) {
        munmap(p, sizeof(SharedState));
        return nullptr;
    }
    return s;
}

SharedState *Publish(SharedState *s) {
    SharedState *expected = nullptr;
    if (g_state.compare_exchange_strong(expected, s, std::memory_order_acq_rel)) return s;
    munmap(s, sizeof(SharedState));
    return expected;
}

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

// ---- simulated usblp nodes -----------------------------------------------
const char *DeviceName(const char *path) {
    if (path == nullptr || std::strncmp(path, kUsbDevPrefix, sizeof(kUsbDevPrefix) - 1) != 0) return nullptr;
    const char *name = path + sizeof(kUsbDevPrefix) - 1;
    const std::size_t len = std::strlen(name);
    if (len == 0 || len >= kMaxDevName) return nullptr;
    return name;
}

DeviceSlot *FindSlot(SharedState *s, const char *name) {
    for (DeviceSlot &d : s->devices) {
        if (d.used.load(std::memory_order_acquire) == 1 && std::strcmp(d.name, name) == 0) return &d;
    }
    return nullptr;
}

DeviceSlot *SlotOfDescriptor(SharedState *s, int fd) {
    bool any = false;
    for (DeviceSlot &d : s->devices) any = any || d.used.load(std::memory_order_acquire) == 1;
    if (!any) return nullptr;
    struct stat st {};
    if (fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) return nullptr;
    for (DeviceSlot &d : s->devices) {
        if (d.used.load(std::memory_order_acquire) == 1 &&
            d.nodeDev.load(std::memory_order_acquire) == static_cast<std::uint64_t>(st.st_dev) &&
            d.nodeIno.load(std::memory_order_acquire) == static_cast<std::uint64_t>(st.st_ino)) {
            return &d;
        }
    }
    return nullptr;
}

// Takes one from a "the next N fail" counter; true when one was left.
bool TakeOne(std::atomic<int> &counter) {
    int n = counter.load(std::memory_order_acquire);
    while (n > 0) {
        if (counter.compare_exchange_weak(n, n - 1, std::memory_order_acq_rel)) return true;
    }
    return false;
}

int Fail(int e) {
    errno = e;
    return -1;
}

// open() of "/dev/usb/<name>".  A device that was never configured does not
// exist.  A present one is opened as its node file, a regular file on the
// sandbox's /dev, which ioctl() recognises again by device and inode.
template <class OpenReal>
int OpenDevice(SharedState *s, const char *name, int flags, OpenReal openReal) {
    DeviceSlot *d = FindSlot(s, name);
    if (d == nullptr) return Fail(ENOENT);
    d->opens.fetch_add(1, std::memory_order_acq_rel);
    d->lastOpenFlags.store(flags, std::memory_order_release);
    if (d->present.load(std::memory_order_acquire) == 0) return Fail(ENOENT);
    if (TakeOne(d->busyOpens)) return Fail(EBUSY);
    return openReal(flags & ~(O_CREAT | O_EXCL | O_TRUNC));
}

constexpr unsigned kIocRead = 2;
constexpr unsigned kDeviceIdNr = 1;
constexpr std::uint32_t kSoftReset = 0x5009;
constexpr std::uint32_t kEnableRequest = 0x40005008;
constexpr std::uint32_t kDisableRequest = 0x40005007;

int DeviceIoctl(DeviceSlot *d, unsigned long request, void *arg) {
    const auto req = static_cast<std::uint32_t>(request);
    const std::uint32_t i = d->requestCount.fetch_add(1, std::memory_order_acq_rel);
    if (i < kMaxRequests) d->requests[i].store(req, std::memory_order_release);
    // A device unplugged under an open descriptor answers nothing more.
    if (d->present.load(std::memory_order_acquire) == 0) return Fail(ENODEV);

    const unsigned dir = req >> 30;
    const std::size_t size = (req >> 16) & 0x3fff;
    const unsigned type = (req >> 8) & 0xff;
    const unsigned nr = req & 0xff;
    if (type == 'P' && nr == kDeviceIdNr && dir == kIocRead) {
        // The device ID request of any buffer size: the driver copies the
        // reply's bytes as they came from the device, no more than the
        // request's size, and leaves the length bytes for the caller to
        // judge (they may state more than was copied).
        if (TakeOne(d->deviceIdFailures)) return Fail(EIO);
        if (arg == nullptr) return Fail(EFAULT);
        const std::size_t n = std::min<std::size_t>(d->replyLen.load(std::memory_order_acquire), size);
        std::memcpy(arg, d->reply, n);
        return 0;
    }
    if (req == kSoftReset) return d->resetAccepted.load(std::memory_order_acquire) != 0 ? 0 : Fail(EIO);
    if (req == kEnableRequest || req == kDisableRequest) return 0;
    return Fail(ENOTTY);
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

SharedState *State() {
    if (SharedState *s = g_state.load(std::memory_order_acquire)) return s;
    SharedState *s = MapStateFile();
    return s != nullptr ? Publish(s) : nullptr;
}

SharedState *CreateState() {
    if (SharedState *s = g_state.load(std::memory_order_acquire)) return s;
    const int fd = RawOpen(kStatePath, O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (fd < 0) return nullptr;
    void *p = MAP_FAILED;
    if (ftruncate(fd, static_cast<off_t>(sizeof(SharedState))) == 0) {
        p = mmap(nullptr, sizeof(SharedState), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    }
    RawClose(fd);
    if (p == MAP_FAILED) return nullptr;
    auto *s = static_cast<SharedState *>(p);  // a new file reads as zeros: all counters 0
    s->magic = kStateMagic;
    return Publish(s);
}

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
    if (SharedState *s = g_state.load(std::memory_order_acquire)) {
        if (DeviceSlot *d = SlotOfDescriptor(s, fd)) return DeviceIoctl(d, request, arg);
    }
    return RealIoctl(fd, request, arg);
}

}  // extern "C"
