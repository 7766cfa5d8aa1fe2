// The simulated usblp nodes "/dev/usb/<name>" as the interposed open() and
// ioctl() see them (the tests configure them through usblp.cc).
#pragma once

#include <fcntl.h>

#include <atomic>
#include <cerrno>

#include "sandbox/shared_state.h"

namespace xavo::test::detail {

// The device name of a path below "/dev/usb/", else nullptr.
const char *DeviceName(const char *path);
// The configured device of the name, else nullptr.
DeviceSlot *FindSlot(SharedState *s, const char *name);
// The configured device whose node file fd is open on, else nullptr.
DeviceSlot *SlotOfDescriptor(SharedState *s, int fd);
// Takes one from a "the next N fail" counter; true when one was left.
bool TakeOne(std::atomic<int> &counter);
// errno = e, and -1.
int Fail(int e);
// A request on an open descriptor of the device, recorded and answered as
// the driver would.
int DeviceIoctl(DeviceSlot *d, unsigned long request, void *arg);

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

}  // namespace xavo::test::detail
