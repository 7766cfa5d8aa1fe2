// Reading a network tool's output line by line under the appliance's rule
// for interrupted reads: a read that a signal cut short is counted and
// retried, and once more than iMaxInterrupted reads have been cut short in
// one call the reading gives up.  The SNMP, mDNS and ping readers survive
// nine interruptions; the BJNP reader none (it retries the whole listing
// instead).  Every line is trimmed of its surrounding white space, newline
// included, before the caller sees it.
#pragma once

#include <cstdio>

#include "internal/line_reader.h"
#include "xavocore.h"

namespace xavo {

inline constexpr int kToolMaxInterruptedReads = 9;

enum class ToolRead {
    kEnd,          // the output ended
    kStopped,      // the caller took what it needed
    kInterrupted,  // too many reads were interrupted
};

// onLine(char *szLine) sees each trimmed line and answers true to go on
// reading, false to stop.  A line longer than the buffer arrives in pieces
// of cbBuf - 1 bytes, each one a line of its own: nothing is read past the
// buffer and nothing accumulates.
template <class OnLine>
ToolRead ReadToolLines(FILE *pStream, char *szBuf, int cbBuf, int iMaxInterrupted, OnLine &&onLine) {
    int nInterrupted = 0;
    for (;;) {
        ReadStatus status = ReadLine(pStream, szBuf, cbBuf);
        if (status == ReadStatus::kEnd) return ToolRead::kEnd;
        if (status == ReadStatus::kInterrupted) {
            if (++nInterrupted > iMaxInterrupted) return ToolRead::kInterrupted;
            continue;
        }
        char *szLine = ORLICStrTrim(szBuf, 0, 0);
        if (!onLine(szLine != nullptr ? szLine : szBuf)) return ToolRead::kStopped;
    }
}

}  // namespace xavo
