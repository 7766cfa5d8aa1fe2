#include <strings.h>
#include <syslog.h>

#include <cstdio>

#include "cups/queue_create.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_cups_printer_enable";
constexpr char kLogRunFailed[] = "%s:%d run cmd failed, cmd=[%s %s], ret=%d";
constexpr char kCupsEnablePath[] = "/usr/bin/cupsenable";
constexpr char kCupsDisablePath[] = "/usr/bin/cupsdisable";
constexpr int kNameSize = 128;
constexpr int kCommandSize = 256;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterCupsPrinterEnable(const char *szCupsPrinterName, int32_t blEnable) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (szCupsPrinterName == nullptr || szCupsPrinterName[0] == '\0') {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        char szName[kNameSize] = {};
        xavo::CopyText(szName, szCupsPrinterName);
        // The alias follows "usbprinter1" however the caller spells it; it
        // is tried only after the queue itself was switched.
        bool bAlias = strcasecmp(szCupsPrinterName, xavo::kFirstUsbQueue) == 0;
        for (int iPass = 0; iPass < (bAlias ? 2 : 1); ++iPass) {
            if (iPass == 1) xavo::CopyText(szName, xavo::kUsbQueueAlias);
            char szCommand[kCommandSize] = {};
            std::snprintf(szCommand, sizeof szCommand, "%s", blEnable != 0 ? kCupsEnablePath : kCupsDisablePath);
            int32_t iResult = ORLICExec(szCommand, szName, nullptr, nullptr, nullptr);
            if (iResult != 0) {
                XLOG(LOG_ERR, kLogRunFailed, szCommand, szName, iResult);
                return -1;
            }
        }
        return 0;
    });
}
