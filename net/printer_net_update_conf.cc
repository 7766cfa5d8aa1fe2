// Adds, replaces or removes a network printer's line of the network
// printer table.
#include <syslog.h>

#include <string>
#include <string_view>

#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "net/net_paths.h"
#include "share/smb_conf.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_update_conf";
constexpr char kLogSetFailed[] = "%s:%d Set nptab failed, devname=%s, device=%s";
constexpr char kLogUpdateFailed[] = "%s:%d %s update entry %s=%s failed.(action=%d)(0x%04X)";
constexpr char kLogSmbFailed[] = "%s:%d update smb.conf failed, printer=%s[0x%04X %s:%d]";
constexpr int32_t kHashCapacity = 1024;
constexpr int32_t kListCapacity = 1024;

// Writes the line ip="name"; false on failure with the error code set.
bool SetEntry(const std::string &ip, const std::string &name) {
    // An entry without an address could never be told apart, and one that
    // breaks its line would add entries nobody asked for.
    if (ip.empty() || !xavo::FitsTableLine(ip) || !xavo::FitsTableLine(name)) {
        XSETERR(ERR_BAD_PARAMETERS);
        return false;
    }
    if (ORLICFileSetKeyValue(xavo::kNptabPath, ip.c_str(), name.c_str(), xavo::kNptabLineFormat) < 0) {
        XLOG(LOG_ERR, kLogSetFailed, ip.c_str(), name.c_str());
        return false;
    }
    return true;
}

// Removes the line of ip only when it names this CUPS printer; false on
// failure with the error code set.
bool RemoveEntry(const std::string &ip, const std::string &name) {
    xavo::SzHash hash(ORLICSzHashAlloc(kHashCapacity));
    xavo::SzList keys(ORLICSzListAlloc(kListCapacity));
    if (!hash || !keys) {
        XSETERR(ERR_OUT_OF_MEMORY);
        return false;
    }
    if (ORLICFileGetPair(xavo::kNptabPath, hash.addr()) <= 0) return true;  // no table: nothing to remove
    if (ORLICSzHashEnumKey(hash.get(), keys.addr()) < 0) return false;
    for (int i = 0; i < xavo::ListCount(keys.get()); ++i) {
        const char *szKey = xavo::ListItem(keys.get(), i);
        if (ip != szKey) continue;
        const char *szValue = ORLICSzHashGetValue(hash.get(), szKey);
        if (szValue == nullptr) {
            XSETERR(ERR_KEY_NOT_FOUND);
            continue;
        }
        // The address alone is not enough: another queue may have taken
        // over the address since, and its line stays.
        if (name != szValue) continue;
        if (ORLICFileRemoveKey(xavo::kNptabPath, szKey) < 0) {
            XSETERR(ERR_REMOVE_KEY);
            return false;
        }
    }
    return true;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetUpdateConf(int32_t iAction, const NetPrinterConf *pNPConf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(nullptr != pNPConf, "((void *)0) != pNPConf")) return -1;
        const std::string ip(xavo::FieldText(pNPConf->szIP));
        const std::string name(xavo::FieldText(pNPConf->szCupsPrinterName));
        const bool bDone = iAction != 0 ? SetEntry(ip, name) : RemoveEntry(ip, name);
        if (!bDone) {
            XLOG(LOG_ERR, kLogUpdateFailed, xavo::kNptabPath, ip.c_str(), name.c_str(), iAction, ORLICErrGet());
            return -1;
        }
        if (iAction == 0) return 0;
        if (xavo::PrinterSmbConfSetup() < 0) {
            XLOG(LOG_ERR, kLogSmbFailed, ip.c_str(), XERR_TAIL);
            return -1;
        }
        return 0;
    });
}
