#include "cups/queue_list.h"

#include <unistd.h>

#include <cerrno>
#include <cstdio>

#include "internal/guards.h"
#include "internal/line_reader.h"
#include "internal/log.h"
#include "xavocore.h"
#include "xavoprinter.h"

namespace xavo {

namespace {
constexpr int kAttempts = 3;
constexpr unsigned kRetryPauseSeconds = 1;
constexpr int kLineSize = 1024;
constexpr char kIpPatternFormat[] = "/%s/";
constexpr int32_t kAllPrinters = XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET;
}  // namespace

bool ReadQueueList(const std::function<void()> &begin, const std::function<bool(const char *)> &line) {
    ErrnoKeeper keep;
    for (int iAttempt = 0; iAttempt < kAttempts; ++iAttempt) {
        Pipe pipe(ORLICPopen(kLpstatPath, "r", "-v", static_cast<const char *>(nullptr)));
        // A tool that does not start costs no pause: nothing of CUPS's
        // state was seen that a pause could let settle.
        if (!pipe) continue;
        begin();
        bool bFailed = false;
        char szLine[kLineSize] = {};
        while (!bFailed) {
            ReadStatus status = ReadLine(pipe.get(), szLine, sizeof szLine);
            if (status == ReadStatus::kEnd) break;
            if (status == ReadStatus::kInterrupted) {
                bFailed = true;
                break;
            }
            char *szTrimmed = ORLICStrTrim(szLine, 0, 0);
            if (line(szTrimmed != nullptr ? szTrimmed : szLine)) break;
        }
        int iClosed = pipe.Close();
        if (!bFailed && iClosed >= 0) return true;
        sleep(kRetryPauseSeconds);
    }
    return false;
}

int32_t CheckQueueList(int32_t iNone, const std::function<int32_t(const char *)> &decide, const char *szUnit,
                       int iLine) {
    int32_t iAnswer = iNone;
    bool bRead = ReadQueueList([&] { iAnswer = iNone; },
        [&](const char *szLine) {
            int32_t iDecided = decide(szLine);
            if (iDecided >= 0) iAnswer = iDecided;
            return iDecided >= 0;
        });
    if (bRead) return iAnswer;
    ORLICErrSetEx(ERR_EXEC, szUnit, iLine);
    return -1;
}

AddressPattern::AddressPattern(const char *szIP) { std::snprintf(sz, sizeof sz, kIpPatternFormat, szIP); }

int32_t CountAllPrinters(const char *szLogEnumFailed, const char *szUnit, int iLine) {
    int32_t iCount = XAVOPrinterEnumCount(kAllPrinters, nullptr);
    if (iCount < 0) {
        Log(LOG_ERR, szLogEnumFailed, szUnit, iLine, XERR_TAIL);
        return -1;
    }
    return iCount;
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
