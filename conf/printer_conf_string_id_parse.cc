// The key search over device ID strings, and the three getters built on it.
// The getters share this unit: each is a fixed list of keys handed to the
// search, and their log lines are the search's own.
#include <strings.h>
#include <syslog.h>

#include <cctype>
#include <iterator>

#include "conf/device_id.h"
#include "internal/boundary.h"
#include "internal/log.h"
#include "internal/text.h"
#include "xavoprinter.h"

namespace {
constexpr char kUnit[] = "printer_conf_string_id_parse";

constexpr const char *kVendorKeys[] = {"MANUFACTURER:", "MFG:", "MFR:"};
constexpr const char *kModelKeys[] = {"MODEL:", "MDL:", "DESCRIPTION:", "DES:"};
constexpr const char *kCmdKeys[] = {"COMMAND SET:", "CMD:"};

template <size_t N>
int32_t FirstKeyFound(char *szStringId, const char *const (&keys)[N], char *szBuf, int32_t cbBuf) {
    for (const char *szKey : keys) {
        if (XAVOPrinterConfStringIdParse(szStringId, szKey, szBuf, cbBuf) == 0) return 0;
    }
    return -1;
}
}  // namespace

namespace xavo {

std::optional<std::string_view> FindDeviceIdKey(std::string_view id, std::string_view key) {
    if (key.empty() || key.size() > id.size()) return std::nullopt;
    for (size_t at = 0; at + key.size() <= id.size(); ++at) {
        if (strncasecmp(id.data() + at, key.data(), key.size()) != 0) continue;
        std::string_view value = id.substr(at + key.size());
        return value.substr(0, value.find(';'));
    }
    return std::nullopt;
}

}  // namespace xavo

XAVO_EXPORT int32_t XAVOPrinterConfStringIdParse(char *szStringId, const char *szType, char *szBuf,
                                                 int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] {
        if (!XARG_OK(nullptr != szStringId, "((void *)0) != szStringId") ||
            !XARG_OK(0 != szStringId[0], "0 != szStringId[0]") ||
            !XARG_OK(nullptr != szType, "((void *)0) != szType") ||
            !XARG_OK(0 != szType[0], "0 != szType[0]") ||
            !XARG_OK(nullptr != szBuf, "((void *)0) != szBuf") || !XARG_OK(0 < cbBuf, "0 < cbBuf")) {
            return -1;
        }
        auto value = xavo::FindDeviceIdKey(szStringId, szType);
        if (!value) return -1;
        xavo::CopyText(szBuf, cbBuf, *value);
        return 0;
    });
}

XAVO_EXPORT int32_t XAVOPrinterConfStringIdGetVendor(char *szStringId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] { return FirstKeyFound(szStringId, kVendorKeys, szBuf, cbBuf); });
}

XAVO_EXPORT int32_t XAVOPrinterConfStringIdGetModel(char *szStringId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] { return FirstKeyFound(szStringId, kModelKeys, szBuf, cbBuf); });
}

XAVO_EXPORT int32_t XAVOPrinterConfStringIdGetCmd(char *szStringId, char *szBuf, int32_t cbBuf) noexcept {
    return XAVO_BOUNDARY(-1, [&] { return FirstKeyFound(szStringId, kCmdKeys, szBuf, cbBuf); });
}
