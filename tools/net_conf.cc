#include "net_conf.h"

#include <cstring>

#include "checks.h"

namespace cli {

NetPrinterConf NetConf(const std::string &ip, const std::string &name) {
    NetPrinterConf conf{};
    const std::string id = ip + "-" + name;
    std::memcpy(conf.szIP, ip.c_str(), std::min(ip.size(), sizeof conf.szIP - 1));
    std::memcpy(conf.szCupsPrinterName, name.c_str(), std::min(name.size(), sizeof conf.szCupsPrinterName - 1));
    std::memcpy(conf.szPrinterId, id.c_str(), std::min(id.size(), sizeof conf.szPrinterId - 1));
    return conf;
}

std::string NetPrinterIdProblem(const std::string &ip, const std::string &name) {
    if (ip.size() + 1 + name.size() > kMaxPrinterId) {
        return "the printer ID " + ip + "-" + name + " would be longer than " + std::to_string(kMaxPrinterId) +
               " characters: choose a shorter queue name";
    }
    return "";
}

}  // namespace cli
