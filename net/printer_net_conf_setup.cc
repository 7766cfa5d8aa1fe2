// Writes a network printer's section of the printer configuration file:
// the stored keys merged with the record's.
#include <syslog.h>

#include <cstring>
#include <string>
#include <vector>

#include "conf/conf_paths.h"
#include "conf/conf_section.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_net_conf_setup";
constexpr int32_t kHashCapacity = 512;

// How the backend decides the "QName" key: the remote queue of an lpd or
// ipp printer is kept when the record gives none; a socket or bjnp printer
// has no queue, so an empty one clears what was stored; any other backend
// leaves "QName" alone.
enum class QNameRule { kPutIfSet, kAlwaysPut, kLeave };

QNameRule QNameRuleOf(const std::string &backend) {
    if (backend == "lpd" || backend == "ipp") return QNameRule::kPutIfSet;
    if (backend == "socket" || backend == "bjnp") return QNameRule::kAlwaysPut;
    return QNameRule::kLeave;
}

// Puts key = value into the hash unless the value is empty and not to be
// written empty.  false when the hash could not take it.
bool NetConfPutKey(ORLICSzHash **ppHash, const char *szKey, const char *szValue, int32_t blWriteEmpty) {
    if (ppHash == nullptr || *ppHash == nullptr || szKey == nullptr || szValue == nullptr) return true;
    if (blWriteEmpty == 0 && szValue[0] == '\0') return true;
    return ORLICSzHashSetValue(ppHash, szKey, szValue) >= 0;
}

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterNetConfSetup(const NetPrinterConf *pNPConf, int32_t blWriteEmpty) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(nullptr != pNPConf, "((void *)0) != pNPConf")) return -1;
        xavo::SzHash hash(ORLICSzHashAlloc(kHashCapacity));
        if (!hash) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        const NetPrinterConf &c = *pNPConf;
        const std::string printerId(xavo::FieldText(c.szPrinterId));
        const std::string backend(xavo::FieldText(c.szBackend));
        struct Put {
            const char *szKey;
            std::string value;
            int32_t blWriteEmpty;
        };
        std::vector<Put> puts = {
            {"IP", std::string(xavo::FieldText(c.szIP)), 0},
            {"cups printer name", std::string(xavo::FieldText(c.szCupsPrinterName)), 0},
            {"Backend", backend, 0},
        };
        const QNameRule rule = QNameRuleOf(backend);
        if (rule != QNameRule::kLeave) {
            puts.push_back({"QName", std::string(xavo::FieldText(c.szQName)), rule == QNameRule::kAlwaysPut ? 1 : 0});
        }
        puts.insert(puts.end(), {
            {"Brand", std::string(xavo::FieldText(c.szBrand)), 0},
            {"Model", std::string(xavo::FieldText(c.szModel)), 0},
            {"enable airprint", std::string(xavo::FieldText(c.szEnableAirprint)), 0},
            {"enable google cloud print", std::string(xavo::FieldText(c.szEnableGoogleCloudPrint)), 0},
            {"driver brand", std::string(xavo::FieldText(c.szDriverBrand)), blWriteEmpty},
            {"driver", std::string(xavo::FieldText(c.szDriver)), blWriteEmpty},
            {"string id", std::string(xavo::FieldText(c.szStringId)), 0},
            {"fit to page", std::string(xavo::FieldText(c.szFitToPage)), 0},
        });

        // The stored section is read under the printer lock, for the
        // reason the USB printer setup gives: two setups of one printer at
        // once would otherwise each merge into the section as it was
        // before the other's write, and the later one drop the earlier's
        // keys.
        xavo::PrinterLock lock;
        if (!lock.held()) {
            XSETERR(ERR_LOCK);
            return -1;
        }
        ORLICFileGetSection(xavo::kPrinterConfPath, printerId.c_str(), hash.addr());
        for (const Put &p : puts) {
            // A key the hash could not take would silently keep its old
            // value: fail before the file is touched instead.
            if (!NetConfPutKey(hash.addr(), p.szKey, p.value.c_str(), p.blWriteEmpty)) {
                XSETERR(ERR_OUT_OF_MEMORY);
                return -1;
            }
        }

        return XWRITE_CONF_SECTION(printerId.c_str(), hash.get());
    });
}
