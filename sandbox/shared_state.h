// State the sandbox shares with every process started inside it: the sleep
// records and the simulated usblp devices.  It lives in a file of the
// sandbox's control directory, mapped MAP_SHARED, so that a forked child
// records into the same place as the test, and so that a program run with
// the preloadable shim (xavo_usblp_preload) finds it by path.
//
// Only lock-free atomics and plain bytes are kept here: the mapping is used
// by unrelated processes at once and must never need a lock that a killed
// process could leave held.
#pragma once

#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>

namespace xavo::test::detail {

inline constexpr char kControlDir[] = "/dev/xavo-sandbox";
inline constexpr char kStatePath[] = "/dev/xavo-sandbox/state";
inline constexpr char kUsbDevDir[] = "/dev/usb";
inline constexpr char kUsbDevPrefix[] = "/dev/usb/";

inline constexpr std::uint32_t kStateMagic = 0x58534e31;  // "XSN1"
inline constexpr int kMaxDevices = 8;
inline constexpr std::size_t kMaxDevName = 64;
// The driver answers a device ID request with at most the 4095 bytes the
// request's size field allows; keep exactly that much of a configured reply.
inline constexpr std::size_t kMaxReply = 4095;
inline constexpr std::uint32_t kMaxRequests = 4096;
inline constexpr std::uint32_t kMaxSleeps = 1u << 16;

struct DeviceSlot {
    std::atomic<int> used;  // 0: free; 1: configured by SetUsblp
    char name[kMaxDevName];
    std::atomic<int> present;
    std::atomic<int> busyOpens;
    std::atomic<int> deviceIdFailures;
    std::atomic<int> resetAccepted;
    std::atomic<std::uint32_t> replyLen;
    unsigned char reply[kMaxReply];
    // Identity of the node file behind "/dev/usb/<name>": descriptors of the
    // device are recognised by it in ioctl().
    std::atomic<std::uint64_t> nodeDev;
    std::atomic<std::uint64_t> nodeIno;
    std::atomic<int> opens;
    std::atomic<int> lastOpenFlags;
    std::atomic<std::uint32_t> requestCount;
    std::atomic<std::uint32_t> requests[kMaxRequests];
};

struct SharedState {
    std::uint32_t magic;
    std::atomic<int> realSleep;
    std::atomic<std::uint32_t> sleepCount;  // may exceed kMaxSleeps: extra ones are lost
    std::atomic<std::uint64_t> sleeps[kMaxSleeps];
    DeviceSlot devices[kMaxDevices];
};

static_assert(std::atomic<int>::is_always_lock_free);
static_assert(std::atomic<std::uint32_t>::is_always_lock_free);
static_assert(std::atomic<std::uint64_t>::is_always_lock_free,
              "the shared state needs address-free 64-bit atomics");
// A 32-bit build's programs share the mapping with the host's 64-bit ones
// (sh, cat) through the preload shim: the layout must not depend on the
// class, which holds while 64-bit atomics are 8-aligned in both.
static_assert(alignof(std::atomic<std::uint64_t>) == 8 && sizeof(DeviceSlot) % 8 == 0,
              "the shared state's layout differs between 32-bit and 64-bit programs");

// The mapping, created by EnterSandbox() or found by path on first use.
// nullptr outside a sandbox.
SharedState *State();
// Creates the state file in the control directory and maps it.
SharedState *CreateState();
// The mapping when this process has made it already, else nullptr, without
// looking for the file: for ioctl(), which only a descriptor opened through
// State() can concern.
SharedState *MappedState();

}  // namespace xavo::test::detail
