#include "conf/conf_section.h"

#include <syslog.h>

#include "conf/conf_paths.h"
#include "internal/log.h"

namespace xavo {

namespace {
constexpr char kLogAddSectionFailed[] = "%s:%d ORLICFileAddSection failed.(0x%04X)";
constexpr char kLogSetSectionFailed[] = "%s:%d ORLICFileSetSection failed.(0x%04X)";
}  // namespace

int32_t WriteConfSection(const char *szSection, const ORLICSzHash *pHash, const char *szUnit, int iLine) {
    const int32_t iAdded = ORLICFileAddSection(kPrinterConfPath, szSection, pHash, kSectionLineFormat);
    if (iAdded > 0) return 0;
    if (iAdded < 0) {
        Log(LOG_ERR, kLogAddSectionFailed, szUnit, iLine, ORLICErrGet());
        return iAdded;
    }
    if (ORLICFileSetSection(kPrinterConfPath, szSection, szSection, pHash, kSectionLineFormat) >= 1) return 0;
    Log(LOG_ERR, kLogSetSectionFailed, szUnit, iLine, ORLICErrGet());
    return -1;
}

}  // namespace xavo
