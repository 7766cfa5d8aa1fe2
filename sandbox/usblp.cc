// The simulated usblp devices and the sleep records, as the tests see them.
// The interposers (interpose.cc, usblp_node.cc) act on the same shared
// state.
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string>
#include <system_error>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"
#include "sandbox/shared_state.h"
#include "sandbox/usblp_node.h"

namespace xavo::test {
namespace detail {
namespace {

constexpr char kNodeStore[] = "/dev/xavo-sandbox/usblp/";

SharedState &Shared() {
    SharedState *s = State();
    if (s == nullptr) throw std::logic_error("the test sandbox was not entered");
    return *s;
}

// Each configured device has one node file in the control directory for
// as long as it is configured; "/dev/usb/<name>" is a hard link to it while
// the device is present.  So a descriptor keeps its identity when the
// device goes and comes back, as a real one does across a driver unbind.
std::string StoreNode(const SharedState &s, const DeviceSlot &d) {
    return kNodeStore + std::to_string(&d - s.devices);
}

void ClearSlot(DeviceSlot &d) {
    d.used.store(0);
    std::memset(d.name, 0, sizeof d.name);
    d.present.store(0);
    d.busyOpens.store(0);
    d.deviceIdFailures.store(0);
    d.resetAccepted.store(0);
    d.replyLen.store(0);
    d.nodeDev.store(0);
    d.nodeIno.store(0);
    d.opens.store(0);
    d.lastOpenFlags.store(-1);
    d.requestCount.store(0);
}

void CheckName(const std::string &name) {
    const bool ok = !name.empty() && name.size() < kMaxDevName && name.front() != '/' && name.back() != '/' &&
                    name.find("..") == std::string::npos && name.find("//") == std::string::npos;
    if (!ok) ThrowErrno(EINVAL, "usblp device name", name);
}

DeviceSlot &Claim(SharedState &s, const std::string &name) {
    if (DeviceSlot *d = FindSlot(&s, name.c_str())) return *d;
    for (DeviceSlot &d : s.devices) {
        if (d.used.load() != 0) continue;
        ClearSlot(d);
        std::memcpy(d.name, name.c_str(), name.size() + 1);
        const std::string store = StoreNode(s, d);
        // mknod, not open: an open of a usblp path would come back to the
        // simulation itself.
        if (mknod(store.c_str(), S_IFREG | 0660, 0) != 0 && errno != EEXIST) ThrowErrno(errno, "mknod", store);
        struct stat st {};
        if (stat(store.c_str(), &st) != 0) ThrowErrno(errno, "stat", store);
        d.nodeDev.store(st.st_dev);
        d.nodeIno.store(st.st_ino);
        d.used.store(1);
        return d;
    }
    ThrowErrno(ENOSPC, "more usblp devices than the sandbox holds:", name);
}

// Node files found through /proc/<pid>/fd, in every process.
int CountOpenDescriptors(std::uint64_t dev, std::uint64_t ino) {
    int count = 0;
    DIR *procs = opendir("/proc");
    if (procs == nullptr) return 0;
    while (dirent *p = readdir(procs)) {
        if (std::strspn(p->d_name, "0123456789") != std::strlen(p->d_name)) continue;
        const std::string fdDir = std::string("/proc/") + p->d_name + "/fd";
        DIR *fds = opendir(fdDir.c_str());
        if (fds == nullptr) continue;
        const int self = dirfd(fds);
        while (dirent *f = readdir(fds)) {
            struct stat st {};
            if (f->d_name[0] == '.' || fstatat(self, f->d_name, &st, 0) != 0) continue;
            if (static_cast<std::uint64_t>(st.st_dev) == dev && static_cast<std::uint64_t>(st.st_ino) == ino) {
                ++count;
            }
        }
        closedir(fds);
    }
    closedir(procs);
    return count;
}

}  // namespace

void ResetUsblp() {
    SharedState &s = Shared();
    for (DeviceSlot &d : s.devices) ClearSlot(d);
    // Leftover nodes of the previous test, and anything it put in /dev/usb.
    RemoveTree(kUsbDevDir);
    RemoveTree(kNodeStore);
    MakeDirs(kUsbDevDir);
    MakeDirs(kNodeStore);
}

void ResetSleeps() {
    SharedState &s = Shared();
    s.realSleep.store(0);
    s.sleepCount.store(0);
}

}  // namespace detail

using namespace detail;

void SetUsblp(const std::string &devName, const UsblpConfig &config) {
    CheckName(devName);
    SharedState &s = Shared();
    DeviceSlot &d = Claim(s, devName);
    const std::size_t n = std::min(config.deviceIdReply.size(), kMaxReply);
    d.replyLen.store(0);
    std::memcpy(d.reply, config.deviceIdReply.data(), n);
    d.replyLen.store(static_cast<std::uint32_t>(n));
    d.busyOpens.store(std::max(config.busyOpens, 0));
    d.deviceIdFailures.store(std::max(config.deviceIdFailures, 0));
    d.resetAccepted.store(config.resetAccepted ? 1 : 0);
    d.present.store(config.present ? 1 : 0);

    const std::string node = kUsbDevPrefix + devName;
    const std::string store = StoreNode(s, d);
    if (config.present) {
        const auto slash = node.rfind('/');
        MakeDirs(node.substr(0, slash));
        if (link(store.c_str(), node.c_str()) != 0 && errno != EEXIST) ThrowErrno(errno, "link", node);
    } else if (unlink(node.c_str()) != 0 && errno != ENOENT) {
        ThrowErrno(errno, "unlink", node);
    }
}

UsblpSeen GetUsblp(const std::string &devName) {
    UsblpSeen seen;
    SharedState &s = Shared();
    DeviceSlot *d = FindSlot(&s, devName.c_str());
    if (d == nullptr) return seen;
    seen.opens = d->opens.load();
    seen.lastOpenFlags = d->lastOpenFlags.load();
    const std::uint32_t n = std::min(d->requestCount.load(), kMaxRequests);
    for (std::uint32_t i = 0; i < n; ++i) seen.requests.push_back(d->requests[i].load());
    seen.openNow = CountOpenDescriptors(d->nodeDev.load(), d->nodeIno.load());
    return seen;
}

std::string UsblpReply(const std::string &text) {
    const std::size_t len = text.size() + 2;
    std::string reply;
    reply += static_cast<char>((len >> 8) & 0xff);
    reply += static_cast<char>(len & 0xff);
    return reply + text;
}

void SetRealSleep(bool bReal) { Shared().realSleep.store(bReal ? 1 : 0); }

std::vector<std::uint64_t> TakeSleeps() {
    SharedState &s = Shared();
    const std::uint32_t n = std::min(s.sleepCount.exchange(0), kMaxSleeps);
    std::vector<std::uint64_t> out;
    out.reserve(n);
    for (std::uint32_t i = 0; i < n; ++i) out.push_back(s.sleeps[i].load());
    return out;
}

}  // namespace xavo::test
