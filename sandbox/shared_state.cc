// The sandbox's shared state file, mapped once per process.  Part of the
// interposers (and of the preload shim), so it reaches the file with raw
// system calls only.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cstddef>

#include "sandbox/shared_state.h"

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

SharedState *MappedState() { return g_state.load(std::memory_order_acquire); }

}  // namespace xavo::test::detail
