// The caller's records, filled the way the appliance's services fill them.
#pragma once

#include <cstdio>
#include <cstring>

#include "xavoprinter.h"

namespace xavo::test {

// A network printer's configuration record; its printer ID is "%s-%s" of
// address and CUPS printer name, and its reserved bytes are junk that the
// library must never read.
inline NetPrinterConf NetRecord(const char *szIP = "10.0.0.5", const char *szName = "office",
                                const char *szBackend = "", const char *szQName = "") {
    NetPrinterConf conf;
    std::memset(&conf, 0, sizeof conf);
    std::memset(conf.abReserved, 'Z', sizeof conf.abReserved);
    std::snprintf(conf.szIP, sizeof conf.szIP, "%s", szIP);
    std::snprintf(conf.szCupsPrinterName, sizeof conf.szCupsPrinterName, "%s", szName);
    std::snprintf(conf.szBackend, sizeof conf.szBackend, "%s", szBackend);
    std::snprintf(conf.szQName, sizeof conf.szQName, "%s", szQName);
    std::snprintf(conf.szPrinterId, sizeof conf.szPrinterId, "%s-%s", szIP, szName);
    return conf;
}

}  // namespace xavo::test
