// Running programs: ORLICExec, ORLICExecl and ORLICExecv (ORLICPopen and
// ORLICPclose are in process_popen.cc, the process lookup of
// ORLICIsProcAlive in process_lookup.cc).
//
// Programs are started without a shell (process_start.cc), so that no text
// handed to us (printer names, addresses, serial numbers) is ever
// interpreted.  Every child:
// - reads its standard input from /dev/null (nothing of the caller's);
// - inherits no descriptor of the caller's other than 1 (all others are
//   closed in the child, whatever their close-on-exec flag); its standard
//   error goes to syslog at debug priority (process_relay.cc);
// - runs with an environment of PATH and LC_ALL=C only;
// - starts with default signal handling and an empty signal mask, whatever
//   the caller ignores or blocks (daemons ignore SIGPIPE, which would keep
//   a tool writing into a closed pipe alive);
// - runs for at most its time limit (process_limits.cc), then is stopped
//   with its process group (process_wait.cc);
// - is always waited for, whatever the caller does with SIGCHLD, and never
//   wakes a SIGCHLD handler of the caller's.
//
// Results: the program's exit status (0 when it succeeded, 1 to 255 when it
// ran and failed), 128 + N when signal N killed it (as a shell reports it),
// and -1 with the last error set when it could not be started, was stopped
// at its time limit, or its end could not be learnt.  Every non-zero result
// sets the last error (ERR_EXEC).
#include <glob.h>

#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "core/internal.h"
#include "core/process_args.h"
#include "core/process_child.h"

using namespace xavo::platform;
using xavo::core::Child;
using xavo::core::kNotRun;
using xavo::core::Stdout;

namespace {
constexpr char kUnit[] = "process";

// ORLICExecl's option word.  0x01: wait for the program and return its
// result (without it the program is started, 0 returned, and the program
// waited for in the background, within its time limit all the same).
// 0x02: the program's standard output goes to /dev/null.  Other bits are
// reserved and ignored (0xBB = wait, discard output, plus reserved bits).
constexpr uint32_t kExeclWait = 0x01;
constexpr uint32_t kExeclQuiet = 0x02;

// The file name patterns ORLICExec expands, each for the one program the
// appliance passes it to.  This table is where the rule lives: a pattern is
// expanded only when the appliance itself wrote it, as a fixed text of its
// own.  Every other argument reaches the program as it is, pattern
// characters included, because it may be built from text the runner cannot
// vouch for: a printer ID holds the serial number a USB device reports, a
// queue name or a path comes from the caller.  Expanding those let a
// printer named "04b8:0005:SN*" overwrite another printer's kept PPD file.
// The spool cleaning's pattern keeps its expansion (without a shell, each
// match one argument): the spool holds files named by whoever prints over
// Samba, and only names with a dot are removed, as before.
struct OwnPattern {
    const char *szProgram;
    const char *szPattern;
};
constexpr OwnPattern kOwnPatterns[] = {
    {"/bin/rm", "/var/services/printer/*.*"},
};

bool IsOwnPattern(const char *szProgram, const char *szArg) {
    for (const OwnPattern &p : kOwnPatterns) {
        if (std::strcmp(p.szProgram, szProgram) == 0 && std::strcmp(p.szPattern, szArg) == 0) return true;
    }
    return false;
}

// Appends the argument, or the names its pattern matches (see
// kOwnPatterns).  A pattern that matches nothing is passed on unchanged, as
// a shell would.
void AppendArgument(const char *szProgram, const char *szArg, std::vector<std::string> *pArgv) {
    glob_t g{};
    if (!IsOwnPattern(szProgram, szArg) || ::glob(szArg, 0, nullptr, &g) != 0) {
        ::globfree(&g);
        pArgv->emplace_back(szArg);
        return;
    }
    try {
        for (size_t i = 0; i < g.gl_pathc; ++i) pArgv->emplace_back(g.gl_pathv[i]);
    } catch (...) {
        ::globfree(&g);
        throw;
    }
    ::globfree(&g);
}

// Waits for a child nobody waits for, without holding up the caller.  The
// thread owns the child only once it exists.
void WaitInBackground(std::unique_ptr<Child> child) {
    Child *pChild = child.get();
    try {
        std::thread([pChild] { std::unique_ptr<Child>(pChild)->Wait(); }).detach();
        static_cast<void>(child.release());
    } catch (...) {
        child->Wait();
    }
}

// Runs a program; with bWait its result, else 0 once started.
int32_t Run(const char *szProgram, const std::vector<std::string> &argv, Stdout out, bool bWait, Failure *pFailure) {
    std::unique_ptr<Child> child = Child::Start(szProgram, argv, out);
    if (child == nullptr) {
        *pFailure = {kErrExec, __LINE__};
        return kNotRun;
    }
    if (!bWait) {
        WaitInBackground(std::move(child));
        return 0;
    }
    const int32_t result = child->Wait();
    if (result != 0) *pFailure = {kErrExec, __LINE__};
    return result;
}

int32_t Report(int32_t result, const Failure &failure) {
    if (result != 0) SetError(failure.code, kUnit, failure.line);
    return result;
}

}  // namespace

namespace xavo::core {

int32_t RunAndWait(const char *szProgram, const std::vector<std::string> &argv, Failure *pFailure) {
    return Run(szProgram, argv, Stdout::kInherit, true, pFailure);
}

}  // namespace xavo::core

XAVO_PLATFORM_API int32_t ORLICExec(const char *szProgram, const char *szArg1, const char *szArg2,
                                    const char *szArg3, const char *szArg4) {
    if (XAVO_INJECTED()) return kNotRun;
    if (szProgram == nullptr || szProgram[0] == '\0') {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        std::vector<std::string> argv{szProgram};
        // The first null slot ends the arguments.
        for (const char *arg : {szArg1, szArg2, szArg3, szArg4}) {
            if (arg == nullptr) break;
            AppendArgument(szProgram, arg, &argv);
        }
        Failure failure;
        return Report(Run(szProgram, argv, Stdout::kInherit, true, &failure), failure);
    });
}

XAVO_PLATFORM_API int32_t ORLICExecl(const char *szProgram, uint32_t uOptions, ...) {
    if (XAVO_INJECTED()) return kNotRun;
    xavo::core::VarArgs args;
    va_list ap;
    va_start(ap, uOptions);
    const bool bArgsOk = xavo::core::CollectArgs(ap, &args);
    va_end(ap);
    if (szProgram == nullptr || szProgram[0] == '\0' || !bArgsOk) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        Failure failure;
        const Stdout out = (uOptions & kExeclQuiet) != 0 ? Stdout::kDiscard : Stdout::kInherit;
        return Report(Run(szProgram, args.Argv(szProgram), out, (uOptions & kExeclWait) != 0, &failure), failure);
    });
}

XAVO_PLATFORM_API int32_t ORLICExecv(const char *szProgram, char *const apszArgv[], int32_t blWait) {
    if (XAVO_INJECTED()) return kNotRun;
    if (szProgram == nullptr || szProgram[0] == '\0' || apszArgv == nullptr || apszArgv[0] == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return kNotRun;
    }
    return XAVO_GUARD(kNotRun, [&] {
        std::vector<std::string> argv;
        for (size_t i = 0; apszArgv[i] != nullptr; ++i) {
            if (i == xavo::core::kMaxArgs) {
                SetError(kErrBadParameters, kUnit, __LINE__);
                return kNotRun;
            }
            argv.emplace_back(apszArgv[i]);
        }
        Failure failure;
        return Report(Run(szProgram, argv, Stdout::kInherit, blWait != 0, &failure), failure);
    });
}
