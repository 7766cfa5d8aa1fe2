// The sandbox's writable layers: the private /dev, built once, and the
// overlays and tmpfs that are made fresh before each test.
#include <fcntl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <map>
#include <string>

#include "sandbox/sandbox_internal.h"

namespace xavo::test::detail {
namespace {

constexpr char kLayers[] = "/dev/xavo-sandbox/layers";
constexpr char kStagingDev[] = "/tmp/.xavo-sandbox-dev";

// Host directories seen through an overlay: the system's programs and
// configuration stay as installed, every write lands in a tmpfs upper layer.
// /root is among them because tools run as root keep dot files in $HOME.
constexpr const char *kOverlays[] = {"/usr", "/etc", "/var", "/root"};

struct Tmpfs {
    const char *path;
    const char *options;
};
// /sys holds only the fake USB tree the tests plug in (see PlugUsbDevice).
constexpr Tmpfs kFreshTmpfs[] = {{"/tmp", "mode=1777"}, {"/run", "mode=0755"}, {"/sys", "mode=0755"}};

// Device nodes shared with the host, bound one by one into the private /dev.
constexpr const char *kDeviceNodes[] = {"null", "zero", "full", "random", "urandom", "tty"};

// What the appliance has at boot and the library does not create: the lock
// directory of its SDK, its configuration directory, the usual /run/lock.
struct LayoutDir {
    const char *path;
    mode_t mode;
};
constexpr LayoutDir kLayoutDirs[] = {
    {"/run/lock", 01777}, {"/run/xavosdk/lock", 0755}, {"/usr/xavo/etc", 0755}};
// Debian installs these CUPS tools in /usr/sbin; the appliance, and so the
// library, runs them from /usr/bin.
constexpr const char *kCupsAdminTools[] = {"lpadmin", "cupsenable", "cupsdisable"};

std::map<std::string, dev_t> g_hostDev;  // st_dev of each replaced directory on the host

void MountOrDie(const char *source, const char *target, const char *type, unsigned long flags,
                const char *data) {
    Must(mount(source, target, type, flags, data) == 0, std::string("mount ") + target);
}

dev_t DevOf(const char *path) {
    struct stat st {};
    Must(stat(path, &st) == 0, std::string("stat ") + path);
    return st.st_dev;
}

// Removes whatever the sandbox (or a test) stacked on a host directory, so
// that it shows the host's directory again.
void UncoverHostDir(const char *path) {
    for (int i = 0; i < 16 && DevOf(path) != g_hostDev.at(path); ++i) {
        Must(umount2(path, MNT_DETACH) == 0, std::string("umount ") + path);
    }
    if (DevOf(path) != g_hostDev.at(path)) Die(std::string("cannot uncover ") + path, EBUSY);
}

void CreateOrDie(const std::string &path, mode_t mode) {
    const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, mode);
    Must(fd >= 0, "create " + path);
    close(fd);
}

void SymlinkOrDie(const char *target, const std::string &link) {
    Must(symlink(target, link.c_str()) == 0, "symlink " + link);
}

void MkdirOrDie(const std::string &path, mode_t mode) {
    Must(mkdir(path.c_str(), mode) == 0 && chmod(path.c_str(), mode) == 0, "mkdir " + path);
}

void LayOutAppliance() {
    for (const LayoutDir &d : kLayoutDirs) {
        MakeDirs(d.path, 0755);
        Must(chmod(d.path, d.mode) == 0, std::string("chmod ") + d.path);
    }
    for (const char *tool : kCupsAdminTools) {
        const std::string bin = std::string("/usr/bin/") + tool;
        const std::string sbin = std::string("/usr/sbin/") + tool;
        struct stat st {};
        if (lstat(bin.c_str(), &st) != 0 && stat(sbin.c_str(), &st) == 0) SymlinkOrDie(sbin.c_str(), bin);
    }
}

}  // namespace

// The private /dev is built on a staging tmpfs (itself on a private /tmp)
// and moved over the host's /dev in one step, so that the host nodes can be
// bound from their usual paths while it is built.
void BuildDev() {
    MountOrDie("xavo-staging", "/tmp", "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755");
    MkdirOrDie(kStagingDev, 0755);
    MountOrDie("xavo-dev", kStagingDev, "tmpfs", MS_NOSUID, "mode=0755");
    const std::string dev = kStagingDev;
    for (const char *node : kDeviceNodes) {
        CreateOrDie(dev + "/" + node, 0666);
        MountOrDie((std::string("/dev/") + node).c_str(), (dev + "/" + node).c_str(), nullptr, MS_BIND,
                   nullptr);
    }
    MkdirOrDie(dev + "/pts", 0755);
    MountOrDie("devpts", (dev + "/pts").c_str(), "devpts", MS_NOSUID | MS_NOEXEC,
               "newinstance,ptmxmode=0666,mode=0620,gid=5");
    SymlinkOrDie("pts/ptmx", dev + "/ptmx");
    MkdirOrDie(dev + "/shm", 01777);
    MountOrDie("shm", (dev + "/shm").c_str(), "tmpfs", MS_NOSUID | MS_NODEV, "mode=1777");
    SymlinkOrDie("/proc/self/fd", dev + "/fd");
    SymlinkOrDie("/proc/self/fd/0", dev + "/stdin");
    SymlinkOrDie("/proc/self/fd/1", dev + "/stdout");
    SymlinkOrDie("/proc/self/fd/2", dev + "/stderr");
    MkdirOrDie(dev + "/usb", 0755);
    MkdirOrDie(dev + "/xavo-sandbox", 0755);
    MkdirOrDie(dev + "/xavo-sandbox/layers", 0700);
    MkdirOrDie(dev + "/xavo-sandbox/usblp", 0755);
    MountOrDie(kStagingDev, "/dev", nullptr, MS_MOVE, nullptr);
    Must(umount2("/tmp", MNT_DETACH) == 0, "umount staging /tmp");
}

// New overlays over the host's directories and new tmpfs for /tmp and
// /run.  The old ones are detached, not unmounted: a process of the
// previous test may still hold a file there, and the memory goes with the
// last user.  The upper layers sit on a tmpfs that is detached right after
// the overlays are made, so no path leads to them but the overlays.
void FreshLayers() {
    for (const char *dir : kOverlays) UncoverHostDir(dir);
    for (const Tmpfs &t : kFreshTmpfs) UncoverHostDir(t.path);

    MountOrDie("xavo-layers", kLayers, "tmpfs", MS_NOSUID | MS_NODEV, "mode=0700");
    for (const char *dir : kOverlays) {
        const std::string base = std::string(kLayers) + dir;
        MkdirOrDie(base, 0700);
        MkdirOrDie(base + "/upper", 0755);
        MkdirOrDie(base + "/work", 0700);
        // The upper layer's root takes the host directory's mode and owner.
        struct stat st {};
        Must(stat(dir, &st) == 0, std::string("stat ") + dir);
        Must(chmod((base + "/upper").c_str(), st.st_mode & 07777) == 0 &&
                 chown((base + "/upper").c_str(), st.st_uid, st.st_gid) == 0,
             "upper layer of " + std::string(dir));
        const std::string options =
            std::string("lowerdir=") + dir + ",upperdir=" + base + "/upper,workdir=" + base + "/work";
        MountOrDie("xavo-overlay", dir, "overlay", 0, options.c_str());
    }
    Must(umount2(kLayers, MNT_DETACH) == 0, "umount layers");

    for (const Tmpfs &t : kFreshTmpfs) MountOrDie("xavo-tmpfs", t.path, "tmpfs", MS_NOSUID | MS_NODEV, t.options);
    LayOutAppliance();
}

void RememberHostDirs() {
    for (const char *dir : kOverlays) g_hostDev[dir] = DevOf(dir);
    for (const Tmpfs &t : kFreshTmpfs) g_hostDev[t.path] = DevOf(t.path);
}

}  // namespace xavo::test::detail
