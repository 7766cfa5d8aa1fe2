// The network printer record as the command fills it.
#pragma once

#include <cstdio>
#include <string>

#include "xavoprinter.h"

namespace cli {

// Copies value into a fixed-size field of a record, cut to fit.
template <std::size_t N>
void PutField(char (&field)[N], const std::string &value) {
    std::snprintf(field, N, "%s", value.c_str());
}

// A zeroed record with address, CUPS queue name and the printer ID the
// appliance gives a network printer: address, "-", queue name (the form
// the network printer table's listing derives).  The caller has checked
// the lengths (see NetPrinterIdProblem).
NetPrinterConf NetConf(const std::string &ip, const std::string &name);
// What keeps "IP-NAME" from being a printer ID, "" when nothing.
std::string NetPrinterIdProblem(const std::string &ip, const std::string &name);

}  // namespace cli
