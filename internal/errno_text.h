// The text of a system error number for log lines.  strerror() may hand
// back a buffer shared by the whole process, and the appliance's services
// call the library from several threads; this keeps the text in the
// caller's own buffer.
#pragma once

#include <cstring>

namespace xavo {

class ErrnoText {
public:
    explicit ErrnoText(int iErr) : sz_(Describe(strerror_r(iErr, buf_, sizeof buf_))) {}
    ErrnoText(const ErrnoText &) = delete;
    ErrnoText &operator=(const ErrnoText &) = delete;
    const char *c_str() const { return sz_; }

private:
    // strerror_r comes in two flavours: the GNU one returns the text (which
    // may be a static string rather than buf_), the POSIX one fills buf_.
    const char *Describe(const char *sz) const { return sz; }
    const char *Describe(int) const { return buf_; }

    char buf_[128] = {};
    const char *sz_;
};

}  // namespace xavo
