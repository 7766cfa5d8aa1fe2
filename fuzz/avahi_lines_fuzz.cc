// The reader of "avahi-browse -arpt": the input is the tool's whole output,
// read through the library's tool-line reader with the mDNS lookup's line
// buffer; each line is split at ";" by the platform's tokenizer and its
// port and TXT fields go through the line parsers, as the lookup does.
#include <cstring>
#include <string>

#include "fuzz/fuzz_support.h"
#include "internal/guards.h"
#include "net/avahi_lines.h"

namespace {

using xavo::fuzz::Within;

constexpr int kTextBuffer = 1024;
constexpr const char *kTxtKeys[] = {"usb_MDL=", "usb_MFG=", "usb_CMD="};

struct KnownPort {
    const char *szBackend;
    const char *szPort;
};
constexpr KnownPort kPorts[] = {{"bjnp", "8611"}, {"socket", "9100"}, {"lpd", "515"}, {"ipp", "631"}};

void CheckPort(std::string_view field) {
    std::optional<xavo::AvahiService> service = xavo::AvahiServiceForPort(field);
    if (!service) return;
    const char *szBackend = xavo::AvahiBackendName(*service);
    bool bListed = false;
    for (const KnownPort &known : kPorts) {
        if (std::strcmp(known.szBackend, szBackend) != 0) continue;
        bListed = true;
        FUZZ_CHECK(field.find(known.szPort) != std::string_view::npos);
    }
    FUZZ_CHECK(bListed);
}

void CheckTxt(std::string_view txt) {
    for (std::string_view key : kTxtKeys) {
        std::optional<std::string_view> value = xavo::AvahiTxtValue(txt, key);
        FUZZ_CHECK(value.has_value() == (txt.find(key) != std::string_view::npos));
        if (!value) continue;
        FUZZ_CHECK(Within(*value, txt));
        FUZZ_CHECK(value->find('"') == std::string_view::npos);
        FUZZ_CHECK(std::string_view(value->data() - key.size(), key.size()) == key);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    // One list for the whole output, as the lookup keeps it: each split
    // adds the line's fields behind the earlier ones.
    xavo::SzList fields(ORLICSzListAlloc(kTextBuffer));
    if (!fields) std::abort();
    xavo::fuzz::ForEachToolLine(xavo::fuzz::AsText(data, size), kTextBuffer, [&](char *szLine, std::string_view) {
        const int iFirst = xavo::ListCount(fields.get());
        if (ORLICStrTok(szLine, ";", fields.addr()) < 0) std::abort();
        const int iCount = xavo::ListCount(fields.get());
        FUZZ_CHECK(iCount >= iFirst);
        for (int i = iFirst; i < iCount; ++i) FUZZ_CHECK(std::strchr(xavo::ListItem(fields.get(), i), ';') == nullptr);
        if (iCount - iFirst < 2) return true;
        CheckPort(xavo::ListItem(fields.get(), iCount - 2));
        CheckTxt(xavo::ListItem(fields.get(), iCount - 1));
        return true;
    });
    return 0;
}
