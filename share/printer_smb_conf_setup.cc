// Makes sure that the Samba printer share "printers" exists.
#include <syslog.h>

#include "internal/guards.h"
#include "internal/log.h"
#include "share/smb_conf.h"
#include "share/smb_paths.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_smb_conf_setup";
constexpr char kLogAddSectionFailed[] = "%s:%d ORLICFileAddSection failed.(0x%04X)";
constexpr int32_t kHashCapacity = 512;

struct ShareKey {
    const char *szKey;
    const char *szValue;
};
// The share's keys, in the order they are handed over.
constexpr ShareKey kShareKeys[] = {
    {"comment", "All Printers"}, {"path", "/var/services/printer"}, {"browseable", "no"}, {"public", "yes"},
    {"guest ok", "yes"},         {"writable", "yes"},              {"printable", "yes"},
};
}  // namespace

namespace xavo {

int32_t PrinterSmbConfSetup() {
    SzHash hash(ORLICSzHashAlloc(kHashCapacity));
    if (!hash) {
        XSETERR(ERR_OUT_OF_MEMORY);
        return -1;
    }
    // A section with entries is the administrator's or ours from before:
    // it is never rewritten, whatever it holds.
    if (ORLICFileGetSection(kSmbReservedConfPath, kSmbPrintersSection, hash.addr()) > 0) return 0;
    for (const ShareKey &k : kShareKeys) {
        // A share written without all of its keys would never be
        // completed: a non-empty section is left alone from then on.
        if (ORLICSzHashSetValue(hash.addr(), k.szKey, k.szValue) < 0) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
    }
    // 0 from the add means that an empty section of that name exists: it
    // counts as set up.
    if (ORLICFileAddSection(kSmbReservedConfPath, kSmbPrintersSection, hash.get(), kSmbLineFormat) < 0) {
        XLOG(LOG_ERR, kLogAddSectionFailed, ORLICErrGet());
        return -1;
    }
    return 0;
}

}  // namespace xavo
