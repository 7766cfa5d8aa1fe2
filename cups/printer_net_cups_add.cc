#include <syslog.h>

#include <cstdio>
#include <string_view>

#include "cups/queue_create.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_cups_add";
constexpr char kLogNoName[] = "%s:%d cannot find cups printer name, printer=%s";
constexpr char kLogAdded[] = "%s:%d add cups network printer=%s, ok";
// "%s://%s/%s" of backend, address and remote queue, each bounded by its
// field.
constexpr char kDeviceUriFormat[] = "%.*s://%.*s/%.*s";
constexpr int kNameSize = 128;
constexpr int kDeviceUriSize = 4096;
}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetCupsAdd(const NetPrinterConf *pNPConf, const char *szPpdFile) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(pNPConf != nullptr, "((void *)0) != pNPConf")) return -1;
        if (!xavo::SchedulerEnsure(kUnit)) return -1;
        // The record's fields are read bounded: a caller's unterminated
        // field is cut at its width, never read past.
        char szPrinterId[sizeof pNPConf->szPrinterId + 1] = {};
        xavo::CopyText(szPrinterId, xavo::FieldText(pNPConf->szPrinterId));
        char szName[kNameSize] = {};
        xavo::CopyText(szName, xavo::FieldText(pNPConf->szCupsPrinterName));
        if (szName[0] == '\0') {
            XLOG(LOG_ERR, kLogNoName, szPrinterId);
            return -1;
        }
        xavo::PpdChoice ppd = xavo::PpdChoose(szPpdFile, szPrinterId, kUnit);
        if (!ppd.bOk) return -1;

        std::string_view backend = xavo::FieldText(pNPConf->szBackend);
        std::string_view ip = xavo::FieldText(pNPConf->szIP);
        std::string_view qname = xavo::FieldText(pNPConf->szQName);
        char szDeviceUri[kDeviceUriSize] = {};
        std::snprintf(szDeviceUri, sizeof szDeviceUri, kDeviceUriFormat, static_cast<int>(backend.size()),
                      backend.data(), static_cast<int>(ip.size()), ip.data(), static_cast<int>(qname.size()),
                      qname.data());

        xavo::LpadminCreate lpadmin;
        if (!lpadmin.Init(szName, szDeviceUri, kUnit, __LINE__)) return -1;
        if (ppd.bUse && !lpadmin.AddPpd(ppd.szPath, kUnit, __LINE__)) return -1;
        if (!lpadmin.Run(kUnit)) return -1;
        XLOG(LOG_ERR, kLogAdded, szName);
        return 0;
    });
}
