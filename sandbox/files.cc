// Files and programs placed in, and read from, the sandbox.
#include <fcntl.h>
#include <ftw.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <system_error>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace xavo::test {
namespace detail {

void ThrowErrno(int err, const std::string &what, const std::string &path) {
    throw std::system_error(err, std::generic_category(), what + " " + path);
}

void MakeDirs(const std::string &path, mode_t mode) {
    for (std::size_t pos = 1; pos != std::string::npos;) {
        pos = path.find('/', pos + 1);
        const std::string part = path.substr(0, pos);
        if (part.empty()) continue;
        if (mkdir(part.c_str(), mode) != 0 && errno != EEXIST) ThrowErrno(errno, "mkdir", part);
    }
}

void RemoveTree(const std::string &path) {
    struct stat st {};
    if (lstat(path.c_str(), &st) != 0) return;
    if (!S_ISDIR(st.st_mode)) {
        if (unlink(path.c_str()) != 0 && errno != ENOENT) ThrowErrno(errno, "unlink", path);
        return;
    }
    const auto removeOne = [](const char *p, const struct stat *, int, FTW *) { return remove(p) != 0 ? errno : 0; };
    const int rc = nftw(path.c_str(), removeOne, 16, FTW_DEPTH | FTW_PHYS);
    if (rc != 0) ThrowErrno(rc > 0 ? rc : errno, "remove", path);
}

}  // namespace detail

using namespace detail;

void PlaceFile(const std::string &path, const std::string &content, mode_t mode) {
    if (path.empty() || path[0] != '/') ThrowErrno(EINVAL, "PlaceFile needs an absolute path:", path);
    const auto slash = path.rfind('/');
    if (slash > 0) MakeDirs(path.substr(0, slash));
    // Written beside the target and renamed over it: a link at the path is
    // replaced rather than followed, and a program being run from the path
    // keeps its old text instead of failing with ETXTBSY.
    const std::string temp = path + ".xavo-new";
    const int fd = ::open(temp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0600);
    if (fd < 0) ThrowErrno(errno, "create", temp);
    std::size_t done = 0;
    int err = 0;
    while (done < content.size() && err == 0) {
        const ssize_t n = write(fd, content.data() + done, content.size() - done);
        if (n > 0) done += static_cast<std::size_t>(n);
        else if (errno != EINTR) err = errno;
    }
    if (err == 0 && fchmod(fd, mode) != 0) err = errno;
    if (close(fd) != 0 && err == 0) err = errno;
    if (err == 0 && rename(temp.c_str(), path.c_str()) != 0) err = errno;
    if (err != 0) {
        unlink(temp.c_str());
        ThrowErrno(err, "write", path);
    }
}

void PlaceProgram(const std::string &path, const std::string &script) { PlaceFile(path, script, 0755); }

std::string ReadFile(const std::string &path) {
    const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) return "";
    std::string out;
    char buf[8192];
    for (;;) {
        const ssize_t n = read(fd, buf, sizeof buf);
        if (n > 0) out.append(buf, static_cast<std::size_t>(n));
        else if (n == 0 || errno != EINTR) break;
    }
    close(fd);
    return out;
}

bool FileExists(const std::string &path) {
    struct stat st {};
    return lstat(path.c_str(), &st) == 0;
}

}  // namespace xavo::test
