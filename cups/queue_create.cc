#include "cups/queue_create.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>

#include "internal/log.h"
#include "internal/name_path.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace xavo {

namespace {
constexpr char kLogStartFailed[] = "%s:%d start %s failed. [0x%04X %s:%d]";
constexpr char kLogPpdMissing[] = "%s:%d add cups printer, ppd file does not exist,path=%s";
constexpr char kLogBackupFailed[] = "%s:%d Failed to backup ppd file: %s[0x%04X %s:%d]";
constexpr char kLogRetry[] = "%s:%d add cups printer=%s, retry(%d) ... %s [%d]";

constexpr int kLpadminAttempts = 3;
constexpr unsigned kLpadminPauseSeconds = 2;
constexpr int kQueueNameSize = 1024;
constexpr int kHostNameSize = 64;
constexpr int kLocationSize = 128;
}  // namespace

bool SchedulerRunning() { return ORLIServiceIsRunning(kSchedulerService) != 0; }

bool SchedulerEnsure(const char *szUnit) {
    if (SchedulerRunning()) return true;
    if (ORLIServiceStart(kSchedulerService, 0) >= 0) return true;
    Log(LOG_ERR, kLogStartFailed, szUnit, __LINE__, kSchedulerService, ORLICErrGet(), ORLICErrorGetFile(),
        ORLICErrorGetLine());
    return false;
}

PpdChoice PpdChoose(const char *szPpdFile, const char *szPrinterId, const char *szUnit) {
    PpdChoice choice;
    struct stat st;
    if (szPpdFile == nullptr || szPpdFile[0] == '\0') {
        // An ID that cannot name a kept copy, or too long for the 512-byte
        // path whole, has none: a cut or redirected path would hand the
        // queue another printer's file.
        choice.bUse = KeptPpdName(szPrinterId) && NamePath(choice.szPath, kKeptPpd, szPrinterId) &&
                      ::stat(choice.szPath, &st) == 0;
        return choice;
    }
    if (::stat(szPpdFile, &st) != 0) {
        Log(LOG_ERR, kLogPpdMissing, szUnit, __LINE__, szPpdFile);
        choice.bOk = false;
        return choice;
    }
    // The queue is made from the caller's file even when keeping a copy
    // fails: the copy only serves later creations that get no file.
    if (PrinterBackupPpd(szPpdFile, szPrinterId) != 0) {
        Log(LOG_ERR, kLogBackupFailed, szUnit, __LINE__, szPpdFile, ORLICErrGet(), ORLICErrorGetFile(),
            ORLICErrorGetLine());
    }
    CopyText(choice.szPath, szPpdFile);
    choice.bUse = true;
    return choice;
}

bool LpadminCreate::Init(const char *szQueue, const char *szDeviceUri, const char *szUnit, int iLine) {
    bool bOk = argv_.Set(0, kLpadminPath) && argv_.Set(1, "-p") && SetQueue(szQueue, szUnit, iLine) &&
               argv_.Set(3, "-E") && argv_.Set(4, "-v") && argv_.Set(5, szDeviceUri);
    char szHost[kHostNameSize] = {};
    if (bOk && ::gethostname(szHost, sizeof szHost) == 0 && szHost[0] != '\0') {
        szHost[sizeof szHost - 1] = '\0';
        char szLocation[kLocationSize] = {};
        CopyText(szLocation, szHost);
        bOk = argv_.Push("-L") && argv_.Push(szLocation);
    }
    if (!bOk) ORLICErrSetEx(ERR_OUT_OF_MEMORY, szUnit, iLine);
    return bOk;
}

bool LpadminCreate::SetQueue(const char *szQueue, const char *szUnit, int iLine) {
    char szName[kQueueNameSize] = {};
    CopyText(szName, szQueue);
    if (argv_.Set(2, szName)) return true;
    ORLICErrSetEx(ERR_OUT_OF_MEMORY, szUnit, iLine);
    return false;
}

bool LpadminCreate::AddPpd(const char *szPpdPath, const char *szUnit, int iLine) {
    size_t iSlot = argv_.Used();
    if (argv_.Push("-P") && argv_.Push(szPpdPath)) {
        ppdSlot_ = iSlot;
        return true;
    }
    ORLICErrSetEx(ERR_OUT_OF_MEMORY, szUnit, iLine);
    return false;
}

void LpadminCreate::DropPpd() {
    if (ppdSlot_ == 0) return;
    argv_.Clear(ppdSlot_ + 1);
    argv_.Clear(ppdSlot_);
    ppdSlot_ = 0;
}

bool LpadminCreate::Run(const char *szUnit) const {
    for (int iAttempt = 1; iAttempt <= kLpadminAttempts; ++iAttempt) {
        int32_t iResult = ORLICExecv(kLpadminPath, argv_.data(), 1);
        if (iResult == 0) return true;
        Log(LOG_ERR, kLogRetry, szUnit, __LINE__, argv_[2], kLpadminAttempts - iAttempt, kLpadminPath, iResult);
        if (iAttempt < kLpadminAttempts) sleep(kLpadminPauseSeconds);
    }
    return false;
}

}  // namespace xavo
