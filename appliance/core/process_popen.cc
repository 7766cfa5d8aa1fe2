// ORLICPopen and ORLICPclose: a program's standard output as a stream.
//
// The stream is a stdio stream over the runner's own reader
// (fopencookie), so that a reader blocked on a program that never ends
// gets the end of the output at the program's time limit (the program is
// then stopped), and the program's standard error is relayed while the
// caller reads.
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <new>

#include "core/fork_local.h"
#include "core/internal.h"
#include "core/process_args.h"
#include "core/process_child.h"

using namespace xavo::platform;
using xavo::core::Child;
using xavo::core::kNotRun;

namespace {
constexpr char kUnit[] = "process";

ssize_t CookieRead(void *pCookie, char *pBuf, size_t cb) {
    try {
        return static_cast<Child *>(pCookie)->ReadOutput(pBuf, cb);
    } catch (...) {
        errno = ENOMEM;
        return -1;
    }
}

// Only the pipe: the program is waited for by ORLICPclose, which still owns
// it when it closes the stream.
int CookieClose(void *pCookie) {
    static_cast<Child *>(pCookie)->CloseOutput();
    return 0;
}

const cookie_io_functions_t kCookieFunctions{CookieRead, nullptr, nullptr, CookieClose};

// A child forked by the host has none of its parent's programs for
// children: it forgets their streams (ORLICPclose must neither wait for nor
// stop a program of its parent's), without touching them.
void ForgetStream(std::pair<FILE *const, std::unique_ptr<Child>> &entry) { static_cast<void>(entry.second.release()); }
using Streams = xavo::core::ForkLocal<std::map<FILE *, std::unique_ptr<Child>>, ForgetStream>;
[[maybe_unused]] const bool kForkHandlers = (Streams::Get(), true);

}  // namespace

XAVO_PLATFORM_API FILE *ORLICPopen(const char *szProgram, const char *szMode, ...) {
    if (XAVO_INJECTED()) return nullptr;
    xavo::core::VarArgs args;
    va_list ap;
    va_start(ap, szMode);
    const bool bArgsOk = xavo::core::CollectArgs(ap, &args);
    va_end(ap);
    // Only reading a program's output is offered; nothing of the appliance
    // writes into a program.
    if (szProgram == nullptr || szProgram[0] == '\0' || szMode == nullptr || std::strcmp(szMode, "r") != 0 ||
        !bArgsOk) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return nullptr;
    }
    return XAVO_GUARD(static_cast<FILE *>(nullptr), [&]() -> FILE * {
        // Until it is registered, a child that cannot be handed out is
        // stopped and reaped by its owner here.
        std::unique_ptr<Child> child = Child::Start(szProgram, args.Argv(szProgram), xavo::core::Stdout::kPipe);
        if (child == nullptr) {
            SetError(kErrExec, kUnit, __LINE__);
            return nullptr;
        }
        FILE *pStream = ::fopencookie(child.get(), "r", kCookieFunctions);
        if (pStream == nullptr) {
            SetError(kErrOpen, kUnit, __LINE__);
            return nullptr;
        }
        try {
            Streams &streams = Streams::Get();
            std::lock_guard guard(streams.mutex);
            streams.table.emplace(pStream, std::move(child));
        } catch (...) {
            std::fclose(pStream);
            throw;
        }
        return pStream;
    });
}

// Closes the stream and waits for its program (at most until its time
// limit): the program's result (see process.cc), or -1 when the stream is
// not one of ORLICPopen's, the program was stopped or cannot be waited for.
// A close that a test makes fail still closes and waits: the failure is
// only reported.
XAVO_PLATFORM_API int32_t ORLICPclose(FILE *pStream) {
    uint32_t uInjected = 0;
    const bool bInjected = XavoStandinEnter(__func__, 1, &uInjected) != 0;
    std::unique_ptr<Child> child;
    {
        Streams &streams = Streams::Get();
        std::lock_guard guard(streams.mutex);
        auto it = pStream != nullptr ? streams.table.find(pStream) : streams.table.end();
        if (it == streams.table.end()) {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return kNotRun;
        }
        child = std::move(it->second);
        streams.table.erase(it);
    }
    // Closing first: a program still writing gets EPIPE (or SIGPIPE) and
    // ends instead of blocking on a pipe nobody reads.
    std::fclose(pStream);
    const int32_t result = child->Wait();
    if (result != 0) SetError(kErrExec, kUnit, __LINE__);
    if (bInjected) {
        SetError(uInjected, kUnit, __LINE__);
        return kNotRun;
    }
    return result;
}
