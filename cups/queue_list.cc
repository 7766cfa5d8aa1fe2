#include "cups/queue_list.h"

#include <unistd.h>

#include <cerrno>

#include "internal/guards.h"
#include "internal/line_reader.h"
#include "xavocore.h"

namespace xavo {

namespace {
constexpr int kAttempts = 3;
constexpr unsigned kRetryPauseSeconds = 1;
constexpr int kLineSize = 1024;
}  // namespace

bool ReadQueueList(QueueListRule &rule) {
    ErrnoKeeper keep;
    for (int iAttempt = 0; iAttempt < kAttempts; ++iAttempt) {
        Pipe pipe(ORLICPopen(kLpstatPath, "r", "-v", static_cast<const char *>(nullptr)));
        // A tool that does not start costs no pause: nothing of CUPS's
        // state was seen that a pause could let settle.
        if (!pipe) continue;
        bool bFailed = !rule.Begin(pipe.get());
        char szLine[kLineSize] = {};
        while (!bFailed) {
            ReadStatus status = ReadLine(pipe.get(), szLine, sizeof szLine);
            if (status == ReadStatus::kEnd) break;
            if (status == ReadStatus::kInterrupted) {
                bFailed = true;
                break;
            }
            char *szTrimmed = ORLICStrTrim(szLine, 0, 0);
            if (rule.Line(szTrimmed != nullptr ? szTrimmed : szLine)) break;
        }
        int iClosed = pipe.Close();
        if (!bFailed && iClosed >= 0) return true;
        sleep(kRetryPauseSeconds);
    }
    return false;
}

std::string_view QueueNameOfLine(std::string_view line) {
    size_t first = line.find(' ');
    if (first == std::string_view::npos) return {};
    size_t second = line.find(' ', first + 1);
    if (second == std::string_view::npos) return {};
    std::string_view name = line.substr(second + 1);
    return name.substr(0, name.find(':'));
}

}  // namespace xavo
