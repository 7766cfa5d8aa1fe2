// The sandbox's life cycle: the private namespaces, the writable layers and
// their renewal before each test, and the processes left behind.
#include <dirent.h>
#include <fcntl.h>
#include <net/if.h>
#include <sched.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <set>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"
#include "sandbox/shared_state.h"

// The platform stand-in's fault injection, when the stand-in is the one
// linked: reset with everything else.  Weak, so that a build against the
// appliance's own libraries links without it.
#if __has_include("appliance/standin_control.h")
#include "appliance/standin_control.h"
extern "C" decltype(XavoStandinReset) XavoStandinReset __attribute__((weak));
#define XAVO_SANDBOX_STANDIN_RESET 1
#endif

namespace xavo::test {
namespace detail {
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

enum class Mode { kNone, kOwner, kAttached };
Mode g_mode = Mode::kNone;
std::map<std::string, dev_t> g_hostDev;  // st_dev of each replaced directory on the host
std::string g_startDir;
int g_hostRoot = -1;
mode_t g_startUmask = 022;

[[noreturn]] void Die(const std::string &what, int err) {
    std::fprintf(stderr, "xavo test sandbox: %s: %s\n", what.c_str(), std::strerror(err));
    std::fflush(stderr);
    // Running the tests outside the sandbox would write to the host.
    std::_Exit(70);
}

void Must(bool ok, const std::string &what) {
    if (!ok) Die(what, errno);
}

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

void BringLoopbackUp() {
    const int fd = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    Must(fd >= 0, "socket for lo");
    ifreq ifr{};
    std::strncpy(ifr.ifr_name, "lo", IFNAMSIZ - 1);
    Must(ioctl(fd, SIOCGIFFLAGS, &ifr) == 0, "SIOCGIFFLAGS lo");
    ifr.ifr_flags = static_cast<short>(ifr.ifr_flags | IFF_UP | IFF_RUNNING);
    Must(ioctl(fd, SIOCSIFFLAGS, &ifr) == 0, "SIOCSIFFLAGS lo");
    close(fd);
}

// Per network namespace settings: any group may send ICMP echo through
// ping sockets (daemons that dropped root), and a syslog flood queues deep
// before a sender has to wait for the capture thread.
void TuneNetworkNamespace() {
    struct Setting {
        const char *path;
        const char *value;
    };
    constexpr Setting kSettings[] = {{"/proc/sys/net/ipv4/ping_group_range", "0 2147483647\n"},
                                     {"/proc/sys/net/unix/max_dgram_qlen", "4096\n"}};
    for (const Setting &s : kSettings) {
        const int fd = ::open(s.path, O_WRONLY | O_CLOEXEC);
        Must(fd >= 0, std::string("open ") + s.path);
        const auto len = static_cast<ssize_t>(std::strlen(s.value));
        Must(write(fd, s.value, static_cast<size_t>(len)) == len, std::string("write ") + s.path);
        close(fd);
    }
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

// ---- processes --------------------------------------------------------------
struct ProcStat {
    pid_t pid;
    pid_t ppid;
    char state;
    std::string comm;
};

std::vector<ProcStat> AllProcesses() {
    std::vector<ProcStat> out;
    DIR *d = opendir("/proc");
    if (d == nullptr) return out;
    while (dirent *e = readdir(d)) {
        char *end = nullptr;
        const long pid = std::strtol(e->d_name, &end, 10);
        if (pid <= 0 || *end != '\0') continue;
        const std::string text = ReadFile(std::string("/proc/") + e->d_name + "/stat");
        // "pid (comm) S ppid ...": comm may hold spaces and parentheses.
        const auto open = text.find('(');
        const auto close = text.rfind(')');
        if (open == std::string::npos || close == std::string::npos || close + 4 > text.size()) continue;
        ProcStat p{static_cast<pid_t>(pid), 0, text[close + 2], text.substr(open + 1, close - open - 1)};
        p.ppid = static_cast<pid_t>(std::strtol(text.c_str() + close + 4, nullptr, 10));
        out.push_back(p);
    }
    closedir(d);
    return out;
}

std::set<std::string> &PerSuiteNames() {
    static std::set<std::string> names;
    return names;
}

}  // namespace

bool IsPerSuite(const std::string &suite) {
    // A parameterised suite runs as "Prefix/Suite".
    const auto slash = suite.rfind('/');
    const std::string bare = slash == std::string::npos ? suite : suite.substr(slash + 1);
    return PerSuiteNames().count(bare) != 0;
}

void ReportLeftovers(const std::string &what) {
    // Zombies are not named: a daemon that detached and was stopped by its
    // test is this process's child now, and only this process reaps it (at
    // the next reset).
    for (const SandboxProcess &p : Descendants()) {
        if (p.state == 'Z') continue;
        std::fprintf(stderr, "[ sandbox  ] still running after %s: pid %d (%s)\n", what.c_str(),
                     static_cast<int>(p.pid), p.comm.c_str());
    }
}

void StopLeftovers() {
    if (g_mode != Mode::kOwner) return;
    std::vector<SandboxProcess> left = Descendants();
    if (left.empty()) return;
    ReportLeftovers("the last test");
    for (const SandboxProcess &p : left) {
        if (p.state != 'Z') kill(p.pid, SIGTERM);
    }
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(3);
    while (std::chrono::steady_clock::now() < deadline) {
        bool running = false;
        for (const SandboxProcess &p : Descendants()) running = running || p.state != 'Z';
        if (!running) break;
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    for (const SandboxProcess &p : Descendants()) {
        if (p.state != 'Z') kill(p.pid, SIGKILL);
    }
    // Reap our own children; the others become ours as their parents die.
    for (int i = 0; i < 50 && !Descendants().empty(); ++i) {
        while (waitpid(-1, nullptr, WNOHANG) > 0) {
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}

}  // namespace detail

using namespace detail;

void EnterSandbox() {
    if (g_mode != Mode::kNone) return;
    // A test executable started by a test (a death test re-running itself)
    // finds the sandbox already there: it joins it and leaves the renewal
    // to the process that built it.
    if (State() != nullptr) {
        g_mode = Mode::kAttached;
        return;
    }
    RememberHostDirs();
    g_hostRoot = ::open("/", O_PATH | O_DIRECTORY | O_CLOEXEC);
    Must(g_hostRoot >= 0, "open the host's root");
    Must(unshare(CLONE_NEWNS | CLONE_NEWNET) == 0, "unshare (the tests need root)");
    // Nothing mounted from here on propagates back to the host, and nothing
    // the host mounts later shows up here.
    // In a chroot whose directory is no mount point this fails with EINVAL;
    // binding it onto itself here would propagate the bind to the host
    // before anything is private, so the caller must do it beforehand.
    Must(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0,
         "make / private (in a chroot, bind-mount its directory onto itself first)");
    BringLoopbackUp();
    TuneNetworkNamespace();
    BuildDev();
    Must(CreateState() != nullptr, "create the sandbox state");
    // Daemons the tests start detach from their parents; as the subreaper
    // this process still sees them, reports them and stops them at the end.
    Must(prctl(PR_SET_CHILD_SUBREAPER, 1) == 0, "PR_SET_CHILD_SUBREAPER");
    char cwd[4096];
    g_startDir = getcwd(cwd, sizeof cwd) != nullptr ? cwd : "/";
    g_startUmask = umask(022);
    umask(g_startUmask);
    g_mode = Mode::kOwner;
    StartLogCapture();
    ResetSandbox();
}

void ResetSandbox() {
    if (g_mode != Mode::kOwner) return;
    // A test that changed directory into a layer about to be replaced would
    // otherwise go on in the detached one.
    Must(chdir(g_startDir.c_str()) == 0, "chdir " + g_startDir);
    umask(g_startUmask);
    // Zombies left by a previous test's processes.
    for (const SandboxProcess &p : Descendants()) {
        if (p.state == 'Z') waitpid(p.pid, nullptr, WNOHANG);
    }
    FreshLayers();
    RestoreSysfs();
    ResetUsblp();
    ResetSleeps();
#ifdef XAVO_SANDBOX_STANDIN_RESET
    if (&XavoStandinReset != nullptr) XavoStandinReset();
#endif
    ClearLogs();
}

std::string HostPath(const std::string &path) {
    // The descriptor's mount belongs to the host's namespace, and a walk
    // that starts from it crosses the host's mount points, not ours.
    return "/proc/self/fd/" + std::to_string(g_hostRoot) + path;
}

bool RegisterPerSuite(const char *szSuite) {
    PerSuiteNames().insert(szSuite);
    return true;
}

std::vector<SandboxProcess> Descendants() {
    const std::vector<ProcStat> all = AllProcesses();
    std::set<pid_t> tree{getpid()};
    std::vector<SandboxProcess> out;
    // Parents are not always listed before their children: repeat until no
    // new descendant turns up.
    for (bool grew = true; grew;) {
        grew = false;
        for (const ProcStat &p : all) {
            if (tree.count(p.ppid) != 0 && tree.insert(p.pid).second) {
                out.push_back({p.pid, p.state, p.comm});
                grew = true;
            }
        }
    }
    return out;
}

}  // namespace xavo::test
