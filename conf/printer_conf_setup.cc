// Writes a USB printer's section of the printer configuration file: the
// stored keys merged with the record's.
#include <syslog.h>

#include <string>

#include "conf/conf_paths.h"
#include "conf/conf_section.h"
#include "internal/boundary.h"
#include "internal/guards.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_conf_setup";

// One key of the section and the record field that feeds it.  Fields marked
// clearable are also put when empty if the caller asks for it, which clears
// the stored value; every other empty field leaves the stored value alone.
struct FieldKey {
    const char *szKey;
    std::string_view (*field)(const UsbPrinterConf &);
    bool bClearable;
};

#define XAVO_FIELD(name) [](const UsbPrinterConf &c) { return xavo::FieldText(c.name); }
// The order in which keys are put into the section.
constexpr FieldKey kFieldKeys[] = {
    {"producer", XAVO_FIELD(szProducer), false},
    {"product name", XAVO_FIELD(szProductName), false},
    {"mode", XAVO_FIELD(szMode), false},
    {"autolock timer", XAVO_FIELD(szAutoLockTimer), true},
    {"manuallock timer", XAVO_FIELD(szManualLockTimer), true},
    {"enable airprint", XAVO_FIELD(szEnableAirprint), false},
    {"enable google cloud print", XAVO_FIELD(szEnableGoogleCloudPrint), false},
    {"driver", XAVO_FIELD(szDriver), true},
    {"driver brand", XAVO_FIELD(szDriverBrand), true},
    {"usblp string id", XAVO_FIELD(szUsblpStringId), false},
    {"fit to page", XAVO_FIELD(szFitToPage), false},
};
#undef XAVO_FIELD

}  // namespace

XAVO_EXPORT int32_t XAVOPrinterConfSetup(const UsbPrinterConf *pPrinterConf, int32_t blWriteEmpty) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (pPrinterConf == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        xavo::SzHash hash(ORLICSzHashAlloc(512));
        if (!hash) {
            XSETERR(ERR_OUT_OF_MEMORY);
            return -1;
        }
        const std::string printerId(xavo::FieldText(pPrinterConf->szPrinterId));

        // The existing section is read under the printer lock, not before
        // it: two processes setting up the same printer at once (the plug-in
        // handler and a settings page, say) would otherwise each merge into
        // the section as it was before the other's write, and the later
        // write would drop the earlier one's keys.
        xavo::PrinterLock lock;
        if (!lock.held()) {
            XSETERR(ERR_LOCK);
            return -1;
        }
        // A missing file or section leaves the hash empty: the section is
        // then created from the record alone.
        ORLICFileGetSection(xavo::kPrinterConfPath, printerId.c_str(), hash.addr());

        for (const FieldKey &fk : kFieldKeys) {
            const std::string value(fk.field(*pPrinterConf));
            if (value.empty() && !(fk.bClearable && blWriteEmpty != 0)) continue;
            // A key that cannot be put would silently keep its old value;
            // fail before the file is touched instead.
            if (ORLICSzHashSetValue(hash.addr(), fk.szKey, value.c_str()) < 0) {
                XSETERR(ERR_OUT_OF_MEMORY);
                return -1;
            }
        }

        return XWRITE_CONF_SECTION(printerId.c_str(), hash.get());
    });
}
