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

// A USB printer's record with only its printer ID filled.
inline UsbPrinterConf UsbRecord(const char *szPrinterId) {
    UsbPrinterConf conf;
    std::memset(&conf, 0, sizeof conf);
    std::snprintf(conf.szPrinterId, sizeof conf.szPrinterId, "%s", szPrinterId);
    return conf;
}

// The cloud print account with one secret or both.
inline PrinterGoogleInfo CloudRecord(const char *szAccount, const char *szPassword, const char *szToken) {
    PrinterGoogleInfo info;
    std::memset(&info, 0, sizeof info);
    std::snprintf(info.szAccount, sizeof info.szAccount, "%s", szAccount);
    std::snprintf(info.szPassword, sizeof info.szPassword, "%s", szPassword);
    std::snprintf(info.szRefreshToken, sizeof info.szRefreshToken, "%s", szToken);
    return info;
}

}  // namespace xavo::test
