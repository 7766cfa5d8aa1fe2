// The USB printer table's side of a USB printer coming or going.
#include <strings.h>
#include <syslog.h>

#include <cstring>

#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "usb/usb_enable.h"
#include "usb/usb_paths.h"
#include "xavocore.h"
#include "xavoprinter.h"

namespace {
// Logged as the operation's own steps.
constexpr const char *kUnit = xavo::kEnableExtUnit;

constexpr char kLogSetUsbtabFailed[] = "%s:%d Set usbtab failed, devname=%s, device=%s";
constexpr char kLogRmUsbtabFailed[] = "%s:%d rm usbtab failed, key=%s";

constexpr int32_t kHashCapacity = 1024;
constexpr int32_t kListCapacity = 1024;

int32_t RemoveByBusId(const char *szBusId) {
    xavo::SzHash hash(ORLICSzHashAlloc(kHashCapacity));
    xavo::SzList keys(ORLICSzListAlloc(kListCapacity));
    if (!hash || !keys) {
        XSETERR(ERR_OUT_OF_MEMORY);
        return -1;
    }
    if (ORLICFileGetPair(xavo::kUsbtabPath, hash.addr()) <= 0) return 0;  // no table: nothing to remove
    const int32_t iKeys = ORLICSzHashEnumKey(hash.get(), keys.addr());
    if (iKeys < 0) return -1;
    const size_t cbBusId = std::strlen(szBusId);
    for (int i = 0; i < xavo::ListCount(keys.get()); ++i) {
        const char *szKey = xavo::ListItem(keys.get(), i);
        if (std::strncmp(szKey, xavo::kUsblpPrefix, sizeof xavo::kUsblpPrefix - 1) != 0) continue;
        const char *szValue = ORLICSzHashGetValue(hash.get(), szKey);
        // A prefix match: "1-1" also takes out "1-1.2", the devices behind
        // a hub on that port.
        if (szValue == nullptr || strncasecmp(szValue, szBusId, cbBusId) != 0) continue;
        if (ORLICFileRemoveKey(xavo::kUsbtabPath, szKey) < 0) {
            XLOG(LOG_ERR, kLogRmUsbtabFailed, szKey);
            return -1;
        }
    }
    return 0;
}

}  // namespace

namespace xavo {

int32_t PrinterUsbtabUpdate(int32_t action, const char *szDevName, const char *szBusId) {
    if (action != 0) {
        if (szDevName == nullptr || szDevName[0] == '\0' || szBusId == nullptr || szBusId[0] == '\0' ||
            !FitsTableLine(szDevName) || !FitsTableLine(szBusId)) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        if (ORLICFileSetKeyValue(kUsbtabPath, szDevName, szBusId, kUsbtabLineFormat) < 0) {
            XLOG(LOG_ERR, kLogSetUsbtabFailed, szDevName, szBusId);
            return -1;
        }
        return 0;
    }
    // An empty bus ID would match every printer's line.  Beside a device
    // name it can only mean "this device": remove by name.  Alone it
    // names nothing.
    if (szBusId != nullptr && szBusId[0] == '\0') {
        if (szDevName == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        szBusId = nullptr;
    }
    if (szBusId != nullptr) return RemoveByBusId(szBusId);
    if (szDevName == nullptr) {
        XSETERR(ERR_BAD_PARAMETERS);
        return -1;
    }
    if (ORLICFileRemoveKey(kUsbtabPath, szDevName) < 0) {
        XLOG(LOG_ERR, kLogRmUsbtabFailed, szDevName);
        return -1;
    }
    return 0;
}

}  // namespace xavo
