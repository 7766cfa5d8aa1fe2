// The sandbox's life cycle: the private namespaces, entered once, and the
// renewal before each test.  The writable layers are built in layers.cc,
// the processes left behind are looked after in processes.cc.
#include <fcntl.h>
#include <net/if.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>
#include <string>
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

[[noreturn]] void Die(const std::string &what, int err) {
    std::fprintf(stderr, "xavo test sandbox: %s: %s\n", what.c_str(), std::strerror(err));
    std::fflush(stderr);
    // Running the tests outside the sandbox would write to the host.
    std::_Exit(70);
}

void Must(bool ok, const std::string &what) {
    if (!ok) Die(what, errno);
}

namespace {

enum class Mode { kNone, kOwner, kAttached };
Mode g_mode = Mode::kNone;
std::string g_startDir;
int g_hostRoot = -1;
mode_t g_startUmask = 022;

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

bool OwnsSandbox() { return g_mode == Mode::kOwner; }

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

}  // namespace xavo::test
