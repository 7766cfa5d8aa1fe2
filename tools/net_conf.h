// The network printer record as the command fills it.
#pragma once

#include <string>

#include "xavoprinter.h"

namespace cli {

// A zeroed record with address, CUPS queue name and the printer ID the
// appliance gives a network printer: address, "-", queue name (the form
// the network printer table's listing derives).  The caller has checked
// the lengths (see NetPrinterIdProblem).
NetPrinterConf NetConf(const std::string &ip, const std::string &name);
// What keeps "IP-NAME" from being a printer ID, "" when nothing.
std::string NetPrinterIdProblem(const std::string &ip, const std::string &name);

}  // namespace cli
