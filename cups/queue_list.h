// The queue list of CUPS ("lpstat -v"), read the one way every lookup of
// the library reads it, each caller bringing its own match rule.
#pragma once

#include <cstdint>
#include <functional>
#include <string_view>

namespace xavo {

inline constexpr char kLpstatPath[] = "/usr/bin/lpstat";

// Runs "lpstat -v" up to 3 times, each caller bringing its own match rule:
// begin() runs at the start of every attempt that got a stream (an attempt
// may restart the caller's answer, or keep what earlier attempts found).
// line(szLine) sees each trimmed line, or piece of a long line; returning
// true ends the reading as a success.  An attempt fails when the tool
// cannot be started (next attempt at once), when a read is interrupted
// (EINTR), or when closing reports a failure; failed attempts that got a
// stream are followed by a 1-second pause, the last one too.  True after
// the first attempt that succeeded, false after three failed ones.  The
// caller's errno is kept.
bool ReadQueueList(const std::function<void()> &begin, const std::function<bool(const char *szLine)> &line);

// How the check operations (of a name, of an address) read the list: the
// first line that decide(szLine) answers (0 or more; -1 for a line that
// does not concern the check) ends the reading with that answer, and a list
// without one answers iNone.  After three failed attempts ERR_EXEC is set
// under the caller's unit and line, and the answer is -1.
int32_t CheckQueueList(int32_t iNone, const std::function<int32_t(const char *szLine)> &decide, const char *szUnit,
                       int iLine);

// The pattern the address checks look for: "/ADDR/".  Network queues carry
// the address between slashes ("socket://ADDR/queue"), so the pattern never
// matches inside a longer address.  An address too long for the 32 bytes
// loses its closing slash; the appliance's callers pass dotted IPv4
// addresses, which always fit.
struct AddressPattern {
    explicit AddressPattern(const char *szIP);
    char sz[32] = {};
};

// The number of the appliance's printers, USB and network, which the
// address checks need before reading the list at all; -1 when they cannot be
// counted, logged with szLogEnumFailed (which ends in the platform's error
// tail) under the caller's unit and line.
int32_t CountAllPrinters(const char *szLogEnumFailed, const char *szUnit, int iLine);

// The queue name of one line "device for NAME: URI": the text after the
// second blank, up to the first ':' (or the end).  Empty when the line has
// fewer than two blanks.
std::string_view QueueNameOfLine(std::string_view line);

}  // namespace xavo
