#include "checks.h"

#include <arpa/inet.h>

namespace cli {
namespace {

std::string CheckIPv4(const std::string &text) {
    // inet_pton takes exactly four dotted decimal numbers up to 255, no
    // leading zeros, nothing else: the form the network printer table and
    // the queues' device URIs use.
    in_addr addr{};
    if (inet_pton(AF_INET, text.c_str(), &addr) != 1) return "'" + text + "' is not a dotted IPv4 address";
    return "";
}

std::string CheckCupsQueueName(const std::string &text) {
    if (text.empty()) return "a CUPS queue name must not be empty";
    if (text.size() > 127) return "a CUPS queue name has at most 127 characters";
    for (unsigned char c : text) {
        // CUPS itself also refuses "\" and "?" in printer names; the
        // library would pass them to lpadmin, which fails after the
        // section and the table line are written.
        if (c <= ' ' || c == 0x7F || c == '/' || c == '#' || c == '\'' || c == '"' || c == '\\' || c == '?') {
            return "a CUPS queue name is printable and holds no blank, '/', '#', '\\', '?' or quote";
        }
    }
    return "";
}

}  // namespace

CLI::Validator IPv4() {
    return CLI::Validator([](std::string &s) { return CheckIPv4(s); }, "IPv4", "IPv4");
}

CLI::Validator CupsQueueName() {
    return CLI::Validator([](std::string &s) { return CheckCupsQueueName(s); }, "QUEUE", "CupsQueueName");
}

CLI::Validator Text(std::size_t max) {
    return CLI::Validator(
        [max](std::string &s) -> std::string {
            if (s.empty()) return "must not be empty";
            if (s.size() > max) return "is longer than " + std::to_string(max) + " characters";
            return "";
        },
        "", "Text");
}

}  // namespace cli
