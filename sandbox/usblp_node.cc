// The simulated usblp nodes behind the interposed open() and ioctl().
#include "sandbox/usblp_node.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

namespace xavo::test::detail {

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

namespace {
constexpr unsigned kIocRead = 2;
constexpr unsigned kDeviceIdNr = 1;
constexpr std::uint32_t kSoftReset = 0x5009;
constexpr std::uint32_t kEnableRequest = 0x40005008;
constexpr std::uint32_t kDisableRequest = 0x40005007;
}  // namespace

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

}  // namespace xavo::test::detail
