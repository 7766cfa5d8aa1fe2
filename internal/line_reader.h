// Reading a program's output line by line with the appliance's EINTR rule:
// errno is cleared before every read, so that a read that returns nothing
// because a signal interrupted it can be told from the end of the output.
// What a caller does with an interruption (go on, count, give up) is its
// own rule; the reading itself is written once, here.
#pragma once

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

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

// Reads the next whole line, however long, into line (newline kept when
// the line had one), growing it as needed: for readers that match text
// anywhere in a line and must not see a long line cut in two.  kLine when
// anything was read; kEnd at the end of the output; kInterrupted when a
// read was interrupted, even part-way through a line (the part read so far
// is in line, and the caller decides what an interruption means).
inline ReadStatus ReadLine(FILE *pStream, std::string &line) {
    line.clear();
    char acPiece[512];
    for (;;) {
        ReadStatus st = ReadLine(pStream, acPiece, static_cast<int>(sizeof acPiece));
        if (st == ReadStatus::kInterrupted) return st;
        if (st == ReadStatus::kEnd) return line.empty() ? ReadStatus::kEnd : ReadStatus::kLine;
        size_t n = std::strlen(acPiece);
        line.append(acPiece, n);
        if (n > 0 && acPiece[n - 1] == '\n') return ReadStatus::kLine;
    }
}

}  // namespace xavo
