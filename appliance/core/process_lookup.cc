// Is a program of a given name running beside us?  ORLICIsProcAlive, and
// the daemon lookup of ORLIServiceIsRunning and ORLIServiceStart.
//
// The CUPS checks of the printer library ask whether cupsd runs before
// every look at the queue list.  Looking through /proc costs a few
// microseconds a process, which on a busy appliance is as much as the
// lpstat run the check is about; so the daemon found last time is looked
// at first, and a scan (which reads each process's short name before
// anything dearer) is made only when that one is gone.
#include <dirent.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <string>

#include "common/text_files.h"
#include "core/internal.h"
#include "core/process_lookup.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "process";
}  // namespace

namespace xavo::core {
namespace {

// The kernel keeps 15 characters of a command name.
constexpr size_t kCommLen = 15;

bool SameMounts(pid_t pid, const struct stat &own) {
    struct stat mounts {};
    const std::string ns = "/proc/" + std::to_string(pid) + "/ns/mnt";
    return ::stat(ns.c_str(), &mounts) == 0 && mounts.st_ino == own.st_ino && mounts.st_dev == own.st_dev;
}

// "pid (comm) state ...": the name may hold ")" itself, so it ends at the
// last one.  True for a process of the name that is neither a zombie nor
// dead.
bool LiveByStat(pid_t pid, std::string_view name) {
    std::string stat;
    const std::string path = "/proc/" + std::to_string(pid) + "/stat";
    if (ReadTextFile(path.c_str(), &stat) != ReadResult::kOk) return false;
    size_t open = stat.find('(');
    size_t close = stat.rfind(')');
    if (open == std::string::npos || close == std::string::npos || close < open || close + 2 >= stat.size()) {
        return false;
    }
    char state = stat[close + 2];
    return std::string_view(stat).substr(open + 1, close - open - 1) == name && state != 'Z' && state != 'X';
}

// The cheap first look of a scan: the short name alone.
bool NamedSo(pid_t pid, std::string_view name) {
    std::string comm;
    const std::string path = "/proc/" + std::to_string(pid) + "/comm";
    if (ReadTextFile(path.c_str(), &comm) != ReadResult::kOk) return false;
    if (!comm.empty() && comm.back() == '\n') comm.pop_back();
    return comm == name;
}

// A daemon counts only when it works on our files: one in another mount
// namespace (a container, a test sandbox) keeps its own /etc and spool.
bool Qualifies(pid_t pid, std::string_view name, const struct stat *pOwnMounts) {
    return LiveByStat(pid, name) && (pOwnMounts == nullptr || SameMounts(pid, *pOwnMounts));
}

pid_t Scan(std::string_view name, const struct stat *pOwnMounts) {
    DIR *proc = ::opendir("/proc");
    if (proc == nullptr) return 0;
    pid_t found = 0;
    while (found == 0) {
        const dirent *e = ::readdir(proc);
        if (e == nullptr) break;
        char *end = nullptr;
        const long pid = std::strtol(e->d_name, &end, 10);
        if (pid <= 0 || *end != '\0') continue;
        if (NamedSo(static_cast<pid_t>(pid), name) && Qualifies(static_cast<pid_t>(pid), name, pOwnMounts)) {
            found = static_cast<pid_t>(pid);
        }
    }
    ::closedir(proc);
    return found;
}

}  // namespace

pid_t FindProcess(std::string_view name, std::atomic<pid_t> *pLastFound) {
    name = name.substr(0, kCommLen);
    // Processes we may not inspect (EACCES) are no failure of ours, and the
    // caller's errno is left alone.
    const int savedErrno = errno;
    struct stat own {};
    const struct stat *pOwn = ::stat("/proc/self/ns/mnt", &own) == 0 ? &own : nullptr;
    pid_t pid = pLastFound != nullptr ? pLastFound->load(std::memory_order_relaxed) : 0;
    if (pid <= 0 || !Qualifies(pid, name, pOwn)) pid = Scan(name, pOwn);
    if (pLastFound != nullptr) pLastFound->store(pid, std::memory_order_relaxed);
    errno = savedErrno;
    return pid;
}

}  // namespace xavo::core

XAVO_PLATFORM_API int32_t ORLICIsProcAlive(const char *szProcName) {
    Counted(__func__);
    if (szProcName == nullptr || szProcName[0] == '\0') return 0;
    return XAVO_GUARD(int32_t{0}, [&] { return xavo::core::FindProcess(szProcName) != 0 ? int32_t{1} : int32_t{0}; });
}
