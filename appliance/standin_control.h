/*
 * standin_control.h - test-only controls of the platform stand-ins
 * (libxavocore.so.6 implements them; the appliance's own libraries do not
 * have them).
 *
 * Every platform operation of the stand-ins (libxavocore, libxavousb,
 * libxavoprintergpl) counts its calls, and a test can make the Nth call of
 * one operation, or of any operation, fail with the operation's own failure
 * value (NULL for allocators and streams, a negative result, 0 for the
 * cipher, non-1 for ORLICFileLockByFile) and a last error code of the test's
 * choice.  A test sweeps an operation's failure paths like this:
 *
 *     for (int n = 1;; ++n) {
 *         XavoStandinReset();
 *         XavoStandinFailCall("*", n, 0x0900);
 *         int32_t r = XAVOPrinterSomething(...);
 *         if (XavoStandinLastFailed() == NULL) break;   // ran out of calls
 *         EXPECT_EQ(r, -1); ... nothing left behind ...
 *     }
 *
 * Operations that have no failure value are counted but never failed:
 * ORLICSzListGet, ORLICSzListFree, ORLICSzHashGetValue, ORLICSzHashFree,
 * ORLICFileExist, ORLICIsProcAlive, ORLICStrTrim, ORLICStrCaseLower.  The
 * four error-state functions (ORLICErrSetEx, ORLICErrGet, ORLICErrorGetFile,
 * ORLICErrorGetLine) are not counted at all, since the platform calls them
 * itself whenever it reports a failure.  XAVOPrinterGPLConfStringIdGet reads
 * through ORLICFileGetSectionValue, so one call of it counts both.
 *
 * The counters and rules live in the memory of the calling process: a
 * process started by ORLICExec and friends runs another program and never
 * calls the platform of its parent, and the printer library does not fork.
 * They are safe to use from several threads.
 */
#ifndef XAVO_STANDIN_CONTROL_H
#define XAVO_STANDIN_CONTROL_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Forgets every counter and failure rule, and the time limit below. */
void XavoStandinReset(void);

/* Makes the nth call (1-based, counted from this moment) of the operation
 * szOp fail with last error uCode; szOp "*" counts every operation that can
 * fail.  Replaces the previous rule; nth 0 or less removes it. */
void XavoStandinFailCall(const char *szOp, int32_t nth, uint32_t uCode);

/* Like XavoStandinFailCall, for iCount calls in a row from the nth on;
 * iCount -1 fails every call from the nth on (for operations the library
 * retries, such as the printer lock). */
void XavoStandinFailCalls(const char *szOp, int32_t nth, int32_t iCount, uint32_t uCode);

/* Calls of szOp since the last reset; "*" gives the calls of all operations
 * that can fail. */
int32_t XavoStandinCallCount(const char *szOp);

/* The operation whose call was failed most recently by a rule since the
 * last reset, or NULL when no rule has fired. */
const char *XavoStandinLastFailed(void);

/* Every program the platform runs is stopped when it has run iSeconds
 * (instead of its own limit, at most 300 s), so that a test of a tool that
 * never exits does not wait minutes; 0 gives every program its own limit
 * again. */
void XavoStandinSetToolTimeLimit(int32_t iSeconds);

#ifdef __cplusplus
}
#endif

#endif /* XAVO_STANDIN_CONTROL_H */
