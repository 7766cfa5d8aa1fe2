// The key search of device ID strings (FindDeviceIdKey) and the exported
// search and getters built on it, against a plain model of the rule: the
// value after the first place where the key occurs, letters compared
// without regard to case, up to the next ";" or the end.
//
// Input: a first byte that picks the key (one of the keys the getters try,
// or for other values the text up to the first newline), a second byte for
// the caller's buffer size, then the device ID string.
#include <cstring>
#include <optional>
#include <string>

#include "conf/device_id.h"
#include "fuzz/fuzz_support.h"
#include "xavoprinter.h"

namespace {

using xavo::fuzz::AsText;
using xavo::fuzz::Within;

constexpr const char *kVendorKeys[] = {"MANUFACTURER:", "MFG:", "MFR:"};
constexpr const char *kModelKeys[] = {"MODEL:", "MDL:", "DESCRIPTION:", "DES:"};
constexpr const char *kCmdKeys[] = {"COMMAND SET:", "CMD:"};

char Fold(char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; }

std::optional<std::string_view> Model(std::string_view id, std::string_view key) {
    if (key.empty()) return std::nullopt;
    for (size_t at = 0; at + key.size() <= id.size(); ++at) {
        size_t i = 0;
        while (i < key.size() && Fold(id[at + i]) == Fold(key[i])) ++i;
        if (i < key.size()) continue;
        std::string_view value = id.substr(at + key.size());
        return value.substr(0, value.find(';'));
    }
    return std::nullopt;
}

// One getter against the model: the first key of its list that is found.
template <size_t N>
void CheckGetter(int32_t (*getter)(char *, char *, int32_t), const char *const (&keys)[N], const std::string &id,
                 int32_t cbBuf) {
    std::optional<std::string_view> expected;
    for (const char *szKey : keys) {
        if ((expected = Model(id, szKey))) break;
    }
    std::string writable = id;
    std::string buf(static_cast<size_t>(cbBuf) + 1, '#');  // one guard byte past the caller's size
    int32_t result = getter(writable.data(), buf.data(), cbBuf);
    FUZZ_CHECK(writable == id);
    FUZZ_CHECK(buf[static_cast<size_t>(cbBuf)] == '#');
    if (!expected) {
        FUZZ_CHECK(result == -1);
        FUZZ_CHECK(buf == std::string(buf.size(), '#'));  // untouched after -1
        return;
    }
    FUZZ_CHECK(result == 0);
    FUZZ_CHECK(std::string(buf.c_str()) == expected->substr(0, static_cast<size_t>(cbBuf) - 1));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view in = AsText(data, size);
    if (in.size() < 2) return 0;
    const auto keyChoice = static_cast<uint8_t>(in[0]);
    const int32_t cbBuf = 1 + static_cast<uint8_t>(in[1]);
    in.remove_prefix(2);
    std::string key;
    if (keyChoice < 9) {
        const char *const all[] = {kVendorKeys[0], kVendorKeys[1], kVendorKeys[2], kModelKeys[0], kModelKeys[1],
                                   kModelKeys[2],  kModelKeys[3],  kCmdKeys[0],    kCmdKeys[1]};
        key = all[keyChoice];
    } else {
        size_t nl = in.find('\n');
        if (nl == std::string_view::npos) return 0;
        key = std::string(in.substr(0, nl));
        in.remove_prefix(nl + 1);
    }
    // The exported operations take C strings: what follows a NUL is not
    // part of the text.
    key = key.c_str();
    const std::string id(std::string(in).c_str());

    std::optional<std::string_view> found = xavo::FindDeviceIdKey(id, key);
    std::optional<std::string_view> expected = Model(id, key);
    FUZZ_CHECK(found.has_value() == expected.has_value());
    if (found) {
        FUZZ_CHECK(Within(*found, id));
        FUZZ_CHECK(found->data() == expected->data() && found->size() == expected->size());
    }

    // The exported search and getters log and refuse empty texts; the
    // fuzzer gives them real ones.
    if (id.empty() || key.empty()) return 0;
    std::string writable = id;
    std::string buf(static_cast<size_t>(cbBuf), '#');
    int32_t result = XAVOPrinterConfStringIdParse(writable.data(), key.c_str(), buf.data(), cbBuf);
    FUZZ_CHECK(writable == id);
    FUZZ_CHECK(result == (expected ? 0 : -1));
    if (expected) FUZZ_CHECK(std::string(buf.c_str()) == expected->substr(0, static_cast<size_t>(cbBuf) - 1));

    CheckGetter(XAVOPrinterConfStringIdGetVendor, kVendorKeys, id, cbBuf);
    CheckGetter(XAVOPrinterConfStringIdGetModel, kModelKeys, id, cbBuf);
    CheckGetter(XAVOPrinterConfStringIdGetCmd, kCmdKeys, id, cbBuf);
    return 0;
}
