// An open file descriptor of a stand-in, closed on every path out of the
// operation that opened it.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace xavo::platform {

class Fd {
public:
    Fd() = default;
    explicit Fd(int fd) : fd_(fd) {}
    Fd(const Fd &) = delete;
    Fd &operator=(const Fd &) = delete;
    ~Fd() { reset(); }

    int get() const { return fd_; }
    int release() { return std::exchange(fd_, -1); }
    // Closes what is open, keeping errno: a failure the caller is about to
    // report must not be replaced by close()'s.
    void reset(int fd = -1) {
        if (fd_ >= 0) {
            int saved = errno;
            ::close(fd_);
            errno = saved;
        }
        fd_ = fd;
    }
    // Closes now and reports the result: a failed close of a written file
    // can be the first sign of a lost write.
    int Close() { return ::close(release()); }

private:
    int fd_ = -1;
};

}  // namespace xavo::platform
