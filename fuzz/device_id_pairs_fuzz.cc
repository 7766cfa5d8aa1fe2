// The pair walk of device ID strings (WalkDeviceIdPairs, the reader of
// XAVOPrinterModelDetect).  Whatever the text, the walk ends, reads nothing
// outside it, and what it answers is a value of a pair: preceded by one of
// the item's keys and its ":", the key starting the text or following a
// ";", the value non-empty, at most 1024 characters and holding no ";".
#include <string>

#include "conf/device_id.h"
#include "fuzz/fuzz_support.h"

namespace {

using xavo::fuzz::AsText;
using xavo::fuzz::Within;

constexpr size_t kMaxPairPart = 1024;

void CheckItem(std::string_view id, std::string_view value, std::string_view key1, std::string_view key2) {
    FUZZ_CHECK(Within(value, id));
    FUZZ_CHECK(!value.empty() && value.size() <= kMaxPairPart);
    FUZZ_CHECK(value.find(';') == std::string_view::npos);
    const size_t at = static_cast<size_t>(value.data() - id.data());
    bool bKeyed = false;
    for (std::string_view key : {key1, key2}) {
        const size_t len = key.size() + 1;
        if (at < len || id.substr(at - len, len) != std::string(key) + ":") continue;
        const size_t start = at - len;
        bKeyed = bKeyed || start == 0 || id[start - 1] == ';';
    }
    FUZZ_CHECK(bKeyed);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // XAVOPrinterModelDetect hands the walk the stored string up to its NUL.
    const std::string id(std::string(AsText(data, size)).c_str());
    xavo::BrandModel found = xavo::WalkDeviceIdPairs(id);
    if (found.brand) CheckItem(id, *found.brand, "MFG", "MANUFACTURER");
    if (found.model) CheckItem(id, *found.model, "MDL", "MODEL");
    return 0;
}
