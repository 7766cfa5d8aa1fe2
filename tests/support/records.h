// The caller's records, filled the way the appliance's services fill them.
#pragma once

#include <cstdio>
#include <cstring>
#include <string>

#include "xavoprinter.h"

namespace xavo::test {

// A record's text field holds its width minus one characters.
template <size_t N>
void Fill(char (&field)[N], const std::string &text) {
    std::snprintf(field, N, "%s", text.c_str());
}

// A network printer's configuration record; its printer ID is "%s-%s" of
// address and CUPS printer name, and its reserved bytes are junk that the
// library must never read.
inline NetPrinterConf NetRecord(const char *szIP = "10.0.0.5", const char *szName = "office",
                                const char *szBackend = "", const char *szQName = "") {
    NetPrinterConf conf{};
    std::memset(conf.abReserved, 'Z', sizeof conf.abReserved);
    Fill(conf.szIP, szIP);
    Fill(conf.szCupsPrinterName, szName);
    Fill(conf.szBackend, szBackend);
    Fill(conf.szQName, szQName);
    Fill(conf.szPrinterId, std::string(szIP) + "-" + szName);
    return conf;
}

// A USB printer's record with only its printer ID filled.
inline UsbPrinterConf UsbRecord(const char *szPrinterId) {
    UsbPrinterConf conf{};
    Fill(conf.szPrinterId, szPrinterId);
    return conf;
}

// The cloud print account with one secret or both.
inline PrinterGoogleInfo CloudRecord(const char *szAccount, const char *szPassword, const char *szToken) {
    PrinterGoogleInfo info{};
    Fill(info.szAccount, szAccount);
    Fill(info.szPassword, szPassword);
    Fill(info.szRefreshToken, szToken);
    return info;
}

}  // namespace xavo::test
