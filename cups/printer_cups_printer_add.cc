#include <syslog.h>

#include <cstdio>
#include <cstring>

#include "conf/conf_paths.h"
#include "cups/queue_create.h"
#include "cups/queue_list.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_printer_add";
constexpr char kLogNoName[] = "%s:%d cannot find cups printer name, printer=%s";
constexpr char kLogNotRunning[] = "%s:%d %s is not running.";
constexpr char kLogSaveFailed[] = "%s:%d save printer name=%s failed, printer=%s [0x%04X %s:%d]";
constexpr char kLogAdded[] = "%s:%d add cups printer=%s, ok";
constexpr char kLogDisableFailed[] = "%s:%d disable printer=%s failed";

constexpr char kQueueNameFormat[] = "usbprinter%d";
constexpr char kSecondQueue[] = "usbprinter2";
constexpr char kDeviceUriFormat[] = "usb:/dev/usb/%s";
constexpr int kNameSize = 64;
constexpr int kDeviceUriSize = 4096;

// The stored name when CUPS does not hold it for another device, else a
// free "usbprinter%d"; false when both are taken.
bool ChooseName(const char *szPrinterId, char (&szName)[kNameSize]) {
    if (XAVOPrinterCupsNameGet(szPrinterId, szName, sizeof szName) == 0) {
        int32_t iCheck = XAVOPrinterCupsNameCheck(szPrinterId, szName);
        if (iCheck == 0 || iCheck == 1) return true;
    }
    int iIndex = 1;
    if (!xavo::SchedulerRunning()) {
        XLOG(LOG_ERR, kLogNotRunning, xavo::kSchedulerService);
    } else {
        // Which of the two USB queue names CUPS already holds.  The marks
        // are kept across attempts: a name seen once is taken, even if a
        // later listing failed half-way.  An unreadable list leaves the
        // marks as far as they got: creation then tries the first name not
        // seen.
        bool bFirstUsed = false;
        bool bSecondUsed = false;
        xavo::ReadQueueList([] {},
                            [&](const char *szLine) {
                                if (!bFirstUsed && std::strstr(szLine, xavo::kFirstUsbQueue) != nullptr) {
                                    bFirstUsed = true;
                                } else if (!bSecondUsed && std::strstr(szLine, kSecondQueue) != nullptr) {
                                    bSecondUsed = true;
                                }
                                return false;
                            });
        if (!bFirstUsed) {
            iIndex = 1;
        } else if (!bSecondUsed) {
            iIndex = 2;
        } else {
            XLOG(LOG_ERR, kLogNoName, szPrinterId);
            return false;
        }
    }
    std::memset(szName, 0, sizeof szName);
    std::snprintf(szName, sizeof szName, kQueueNameFormat, iIndex);
    return true;
}

void RecordName(const char *szPrinterId, const char *szName) {
    bool bSaved = false;
    {
        xavo::PrinterLock lock;
        if (lock.held()) {
            bSaved = ORLICFileSetSectionValue(xavo::kPrinterConfPath, szPrinterId, xavo::kKeyCupsPrinterName,
                                              szName) >= 0;
        }
    }
    if (!bSaved) XLOG(LOG_ERR, kLogSaveFailed, szName, szPrinterId, XERR_TAIL);
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsAdd(const char *szPrinterId, const char *szPpdFile) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szPrinterId == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        if (!xavo::SchedulerEnsure(kUnit)) return -1;
        if (!XARG_OK(szPrinterId[0] != '\0', "0 != szPrinterId[0]")) {
            XLOG(LOG_ERR, kLogNoName, szPrinterId);
            return -1;
        }
        char szName[kNameSize] = {};
        if (!ChooseName(szPrinterId, szName)) return -1;
        // Written even when the stored name was kept, so that a section
        // whose key was lost gets it back.
        RecordName(szPrinterId, szName);

        xavo::PpdChoice ppd = xavo::PpdChoose(szPpdFile, szPrinterId, kUnit);
        if (!ppd.bOk) return -1;

        char szDeviceUri[kDeviceUriSize] = {};
        std::snprintf(szDeviceUri, sizeof szDeviceUri, kDeviceUriFormat, szPrinterId);
        xavo::LpadminCreate lpadmin;
        if (!lpadmin.Init(szName, szDeviceUri, kUnit, __LINE__)) return -1;
        if (ppd.bUse && !lpadmin.AddPpd(ppd.szPath, kUnit, __LINE__)) return -1;

        // The first pass makes the printer's queue; "usbprinter1" is
        // followed by its alias, same device and location, never a PPD.
        const char *szQueue = szName;
        for (int iPass = 0; iPass < 2; ++iPass) {
            if (iPass == 1) {
                lpadmin.DropPpd();
                if (!lpadmin.SetQueue(xavo::kUsbQueueAlias, kUnit, __LINE__)) return -1;
                szQueue = xavo::kUsbQueueAlias;
            }
            if (!lpadmin.Run(kUnit)) return -1;
            XLOG(LOG_ERR, kLogAdded, szQueue);
            // Created accepting jobs; held until the appliance enables it.
            if (XAVOPrinterCupsPrinterEnable(szQueue, 0) < 0) XLOG(LOG_ERR, kLogDisableFailed, szPrinterId);
            if (iPass == 0 && std::strstr(szQueue, xavo::kFirstUsbQueue) == nullptr) break;
        }
        return 0;
    });
}
