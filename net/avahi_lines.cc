#include "net/avahi_lines.h"

#include <cstdint>

namespace xavo {

namespace {

struct ServicePort {
    int port;
    AvahiService service;
    const char *szBackend;
};
constexpr ServicePort kServicePorts[] = {
    {8611, kAvahiBjnp, "bjnp"},
    {9100, kAvahiSocket, "socket"},
    {515, kAvahiLpd, "lpd"},
    {631, kAvahiIpp, "ipp"},
};

// atoi's reading: blanks, a sign, digits; 0 when there are none.
int64_t DecimalPrefix(std::string_view text) {
    size_t i = 0;
    while (i < text.size() && (text[i] == ' ' || text[i] == '\t')) ++i;
    bool bNegative = false;
    if (i < text.size() && (text[i] == '+' || text[i] == '-')) bNegative = text[i++] == '-';
    int64_t value = 0;
    for (; i < text.size() && text[i] >= '0' && text[i] <= '9'; ++i) {
        value = value * 10 + (text[i] - '0');
        if (value > 0xFFFFFF) break;  // far past any port: no service either way
    }
    return bNegative ? -value : value;
}

}  // namespace

std::optional<AvahiService> AvahiServiceForPort(std::string_view portField) {
    int64_t port = DecimalPrefix(portField);
    for (const ServicePort &known : kServicePorts) {
        if (known.port == port) return known.service;
    }
    return std::nullopt;
}

const char *AvahiBackendName(AvahiService service) {
    for (const ServicePort &known : kServicePorts) {
        if (known.service == service) return known.szBackend;
    }
    return "";
}

std::optional<std::string_view> AvahiTxtValue(std::string_view txt, std::string_view key) {
    size_t at = txt.find(key);
    if (at == std::string_view::npos) return std::nullopt;
    std::string_view value = txt.substr(at + key.size());
    // A record cut short (the tool's line was longer than the buffer) has
    // no closing quote: what is there is the best the printer told us.
    size_t quote = value.find('"');
    return quote == std::string_view::npos ? value : value.substr(0, quote);
}

}  // namespace xavo
