// The queue list of CUPS ("lpstat -v"), read the one way every lookup of
// the library reads it, each caller bringing its own match rule.
#pragma once

#include <cstdio>
#include <string_view>

namespace xavo {

inline constexpr char kLpstatPath[] = "/usr/bin/lpstat";

// A caller's match rule.  Begin() runs at the start of every attempt that
// got a stream (an attempt may restart the caller's answer, or keep what
// earlier attempts found); returning false fails the attempt.  Line() sees
// each trimmed line, or piece of a long line; returning true ends the
// reading as a success.
class QueueListRule {
public:
    virtual bool Begin(const FILE *pPipe) = 0;
    virtual bool Line(const char *szLine) = 0;

protected:
    ~QueueListRule() = default;
};

// Runs "lpstat -v" up to 3 times.  An attempt fails when the tool cannot be
// started (next attempt at once), when a read is interrupted (EINTR), when
// the rule's Begin() refuses, or when closing reports a failure; failed
// attempts that got a stream are followed by a 1-second pause, the last one
// too.  True after the first attempt that succeeded, false after three
// failed ones.  The caller's errno is kept.
bool ReadQueueList(QueueListRule &rule);

// The queue name of one line "device for NAME: URI": the text after the
// second blank, up to the first ':' (or the end).  Empty when the line has
// fewer than two blanks.
std::string_view QueueNameOfLine(std::string_view line);

}  // namespace xavo
