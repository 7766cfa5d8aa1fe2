#include "net_conf.h"

#include "checks.h"

namespace cli {

NetPrinterConf NetConf(const std::string &ip, const std::string &name) {
    NetPrinterConf conf{};
    PutField(conf.szIP, ip);
    PutField(conf.szCupsPrinterName, name);
    PutField(conf.szPrinterId, ip + "-" + name);
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
