#include "lists.h"

#include <algorithm>
#include <cstdlib>

namespace cli {

std::vector<std::string> Items(const ORLICSzList *list) {
    std::vector<std::string> out;
    for (int32_t i = 0; list != nullptr && i < list->iCount; ++i) out.emplace_back(ORLICSzListGet(list, i));
    return out;
}

std::vector<std::string> HashKeys(const ORLICSzHash *hash) {
    ORLICSzList *raw = ORLICSzListAlloc(64);
    if (raw == nullptr) return {};
    const int32_t r = ORLICSzHashEnumKey(hash, &raw);
    OwnedList keys(raw);
    return r < 0 ? std::vector<std::string>{} : Items(keys.get());
}

bool Contains(const std::vector<std::string> &items, const std::string &item) {
    return std::find(items.begin(), items.end(), item) != items.end();
}

int32_t ReadSection(const std::string &printerId, OwnedHash &hash) {
    ORLICSzHash *raw = hash.release();
    const int32_t n = ORLICFileGetSection(kPrinterConf, printerId.c_str(), &raw);
    hash.reset(raw);
    return n;
}

namespace {

// The items a library listing appends to a fresh list; none when it fails.
std::vector<std::string> Listed(int32_t (*list)(ORLICSzList **)) {
    ORLICSzList *raw = ORLICSzListAlloc(8);
    if (raw == nullptr) return {};
    const int32_t r = list(&raw);
    OwnedList owned(raw);
    return r < 0 ? std::vector<std::string>{} : Items(owned.get());
}

}  // namespace

std::vector<std::string> UsbPrinterIds() { return Listed(XAVOPrinterProcUsbtabIdEnum); }

std::vector<std::string> UsbtabDevices() {
    char **ppszNames = nullptr;
    int32_t iCount = 0;
    if (XAVOPrinterUsbtabEnum(&ppszNames, &iCount) != 0) return {};
    // One allocation holds the array and its texts.
    std::unique_ptr<char *, decltype(&std::free)> owner(ppszNames, &std::free);
    std::vector<std::string> out;
    for (int32_t i = 0; i < iCount; ++i) out.emplace_back(ppszNames[i]);
    return out;
}

std::vector<std::string> NetPrinterIds() { return Listed(XAVOPrinterNetNptabEnum); }

}  // namespace cli
