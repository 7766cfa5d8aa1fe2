// Fills the brand and model of a USB printer's record from the device ID
// string stored for it, by the pair walk.
#include <cstring>
#include <string>

#include "conf/device_id.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"
#include "xavoprintergpl.h"

namespace {
constexpr char kUnit[] = "printer_model_detect";
constexpr int32_t kStringIdBufSize = 4096;
// Longest key or value the walk reads in one pair.
constexpr size_t kMaxPairPart = 1024;
}  // namespace

namespace xavo {

BrandModel WalkDeviceIdPairs(std::string_view id) {
    BrandModel found;
    size_t at = 0;
    while (at < id.size() && !(found.brand && found.model)) {
        size_t colon = id.find(':', at);
        if (colon == std::string_view::npos) break;  // no more pairs
        size_t end = id.find(';', colon + 1);
        if (end == std::string_view::npos) end = id.size();
        // The key runs to the next ":", a ";" inside it included: in
        // "CLS;MDL:X;" the key is "CLS;MDL", which names no model.
        std::string_view key = id.substr(at, colon - at);
        std::string_view value = id.substr(colon + 1, end - colon - 1);
        // A pair that cannot be read (an empty or overlong key) is stepped
        // over rather than ending the walk: one malformed pair from a
        // printer should not hide the model after it.  An empty value is
        // not taken as found, so that a later pair that carries the item
        // can still give it.
        if (!key.empty() && key.size() <= kMaxPairPart && !value.empty()) {
            value = value.substr(0, kMaxPairPart);
            if (!found.brand && (key == "MFG" || key == "MANUFACTURER")) {
                found.brand = value;
            } else if (!found.model && (key == "MDL" || key == "MODEL")) {
                found.model = value;
            }
        }
        at = end + 1;
    }
    return found;
}

}  // namespace xavo

XAVO_EXPORT int32_t XAVOPrinterModelDetect(UsbPrinterConf *pPrinterConf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (pPrinterConf == nullptr) {
            XSETERR(ERR_BAD_PARAMETERS);
            return -1;
        }
        const std::string printerId(xavo::FieldText(pPrinterConf->szPrinterId));
        char szStringId[kStringIdBufSize] = {};
        if (XAVOPrinterGPLConfStringIdGet(printerId.c_str(), szStringId, kStringIdBufSize) != 0 ||
            szStringId[0] == '\0') {
            XSETERR(ERR_EXEC);
            return -1;
        }
        // The helper library promises a NUL-terminated text; bound the read
        // to the buffer all the same.
        auto found = xavo::WalkDeviceIdPairs(std::string_view(szStringId, strnlen(szStringId, kStringIdBufSize)));
        if (found.brand) xavo::CopyText(pPrinterConf->szBrand, *found.brand);
        if (found.model) xavo::CopyText(pPrinterConf->szModel, *found.model);
        return 0;
    });
}
