// Round trip of the platform's key-value files (the USB and network printer
// tables, the USB/IP status files): on any existing file, a key set with
// ORLICFileSetKeyValue reads back exactly as written, or the write is
// refused and the file is left as it was; a removed key reads as missing;
// every other key reads as before.
#include <fuzzer/FuzzedDataProvider.h>

#include "fuzz/file_support.h"

namespace {

using xavo::fuzz::CText;
using xavo::fuzz::TextMap;
constexpr char kLineFormat[] = "%s=\"%s\"\n";

TextMap Pairs(const char *szPath) {
    xavo::SzHash hash(ORLICSzHashAlloc(16));
    ORLICFileGetPair(szPath, hash.addr());
    return xavo::fuzz::HashToMap(hash.get());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    FuzzedDataProvider in(data, size);
    const bool bRemove = in.ConsumeBool();
    const std::string key = CText(in.ConsumeRandomLengthString(32));
    const std::string value = CText(in.ConsumeRandomLengthString(128));
    const int32_t cbBuf = in.ConsumeIntegralInRange(1, 256);
    const std::string initial = xavo::fuzz::NoNul(in.ConsumeRemainingBytesAsString());

    const xavo::fuzz::ScratchFile file("nptab");
    file.Write(initial);
    TextMap expected = Pairs(file.path());

    std::string buf(static_cast<size_t>(cbBuf), '#');
    if (bRemove) {
        if (ORLICFileRemoveKey(file.path(), key.c_str()) < 0) {
            FUZZ_CHECK(file.Read() == initial);
            return 0;
        }
        expected.erase(key);
        FUZZ_CHECK(ORLICFileGetKeyValue(file.path(), key.c_str(), buf.data(), cbBuf, 0) < 0);
    } else {
        if (ORLICFileSetKeyValue(file.path(), key.c_str(), value.c_str(), kLineFormat) < 0) {
            FUZZ_CHECK(file.Read() == initial);
            return 0;
        }
        expected[key] = value;
        FUZZ_CHECK(ORLICFileGetKeyValue(file.path(), key.c_str(), buf.data(), cbBuf, 0) >= 0);
        FUZZ_CHECK(std::string(buf.c_str()) == value.substr(0, static_cast<size_t>(cbBuf) - 1));
    }
    FUZZ_CHECK(Pairs(file.path()) == expected);
    return 0;
}
