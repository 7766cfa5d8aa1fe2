// ORLICIsProcAlive and the process lookup of the service operations: is a
// program of a given name running beside us?
#include <dirent.h>
#include <sys/stat.h>

#include <cerrno>
#include <string>
#include <string_view>

#include "common/text_files.h"
#include "core/internal.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "process";

bool IsDigits(const char *sz) {
    if (*sz == '\0') return false;
    for (; *sz != '\0'; ++sz) {
        if (*sz < '0' || *sz > '9') return false;
    }
    return true;
}

}  // namespace

namespace xavo::core {

bool ProcessAlive(std::string_view name) {
    // The kernel keeps 15 characters of a command name.
    constexpr size_t kCommLen = 15;
    name = name.substr(0, kCommLen);
    // A service counts as running for the caller only when it works on the
    // caller's files: a daemon in another mount namespace (a container, a
    // test sandbox) keeps its own /etc/cups and its own spool, and is no
    // use to us.
    // Looking through /proc meets processes we may not inspect (EACCES):
    // that is no failure of ours, and the caller's errno is left alone.
    const int savedErrno = errno;
    struct stat ownMounts {};
    const bool bKnowOwnMounts = ::stat("/proc/self/ns/mnt", &ownMounts) == 0;
    DIR *proc = ::opendir("/proc");
    if (proc == nullptr) return false;
    bool bFound = false;
    std::string stat;
    while (!bFound) {
        dirent *e = ::readdir(proc);
        if (e == nullptr) break;
        if (!IsDigits(e->d_name)) continue;
        if (bKnowOwnMounts) {
            struct stat mounts {};
            std::string ns = std::string("/proc/") + e->d_name + "/ns/mnt";
            if (::stat(ns.c_str(), &mounts) != 0 || mounts.st_ino != ownMounts.st_ino ||
                mounts.st_dev != ownMounts.st_dev) {
                continue;
            }
        }
        std::string path = std::string("/proc/") + e->d_name + "/stat";
        if (xavo::platform::ReadTextFile(path.c_str(), &stat) != ReadResult::kOk) continue;
        // "pid (comm) state ...": the name may hold ")" itself, so it ends
        // at the last one.
        size_t open = stat.find('(');
        size_t close = stat.rfind(')');
        if (open == std::string::npos || close == std::string::npos || close < open || close + 2 >= stat.size()) {
            continue;
        }
        char state = stat[close + 2];
        bFound = std::string_view(stat).substr(open + 1, close - open - 1) == name && state != 'Z' && state != 'X';
    }
    ::closedir(proc);
    errno = savedErrno;
    return bFound;
}

}  // namespace xavo::core

XAVO_PLATFORM_API int32_t ORLICIsProcAlive(const char *szProcName) {
    Counted(__func__);
    if (szProcName == nullptr || szProcName[0] == '\0') return 0;
    return XAVO_GUARD(int32_t{0}, [&] { return xavo::core::ProcessAlive(szProcName) ? int32_t{1} : int32_t{0}; });
}
