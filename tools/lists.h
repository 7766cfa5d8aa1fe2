// The platform's containers and the library's listings as owned C++
// values: one owner per list, hash or array, released on every path.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "xavoprinter.h"

namespace cli {

struct ListFree {
    void operator()(ORLICSzList *p) const { ORLICSzListFree(p); }
};
using OwnedList = std::unique_ptr<ORLICSzList, ListFree>;
struct HashFree {
    void operator()(ORLICSzHash *p) const { ORLICSzHashFree(p); }
};
using OwnedHash = std::unique_ptr<ORLICSzHash, HashFree>;

std::vector<std::string> Items(const ORLICSzList *list);
std::vector<std::string> HashKeys(const ORLICSzHash *hash);
bool Contains(const std::vector<std::string> &items, const std::string &item);

// The printer configuration file: a section per printer ID.
constexpr char kPrinterConf[] = "/usr/xavo/etc/printer.conf";
// Reads the printer's section into `hash`, which the platform may grow
// into a new one: the number of keys, 0 or less when there is none.
int32_t ReadSection(const std::string &printerId, OwnedHash &hash);

// Printer IDs of the USB printers present ("" list when none or unreadable).
std::vector<std::string> UsbPrinterIds();
// Device names in the USB printer table.
std::vector<std::string> UsbtabDevices();
// Network printer IDs ("IP-NAME") of the network printer table.
std::vector<std::string> NetPrinterIds();

}  // namespace cli
