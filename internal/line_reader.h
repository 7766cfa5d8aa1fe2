// Reading a program's output line by line with the appliance's EINTR rule:
// errno is cleared before every read, so that a read that returns nothing
// because a signal interrupted it can be told from the end of the output.
// What a caller does with an interruption (go on, count, give up) is its
// own rule; the reading itself is written once, here.
#pragma once

#include <cerrno>
#include <cstdio>

namespace xavo {

enum class ReadStatus { kLine, kEnd, kInterrupted };

// Reads the next line, or the next piece of a line longer than the buffer,
// into szBuf (fgets semantics, newline kept).
inline ReadStatus ReadLine(FILE *pStream, char *szBuf, int cbBuf) {
    errno = 0;
    if (std::fgets(szBuf, cbBuf, pStream) != nullptr) return ReadStatus::kLine;
    if (errno == EINTR) {
        // The stream's error flag is set; clear it so that the next read
        // tries the descriptor again instead of failing at once.
        std::clearerr(pStream);
        return ReadStatus::kInterrupted;
    }
    return ReadStatus::kEnd;
}

}  // namespace xavo
