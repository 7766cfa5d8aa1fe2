// The appliance's USB library: the printers of the USB printer table and
// their device information from sysfs.
#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "common/temp_files.h"
#include "common/text_files.h"
#include "xavousb.h"

using namespace xavo::platform;

namespace {
constexpr char kUnit[] = "usb_dev";

constexpr char kUsbTable[] = "/tmp/usbtab";
// Keys of the table that name usblp devices; other keys are not devices.
constexpr char kDevicePrefix[] = "lp";
constexpr char kUsbmiscDir[] = "/sys/class/usbmisc/";

// Device kinds.  A usblp device sits on an interface of class 07 (printer);
// it is reported as kind 0x04.  0x08 is the appliance's second printer kind
// (printers behind vendor-specific interfaces), which usblp never binds.
constexpr uint32_t kKindPrinter = 0x04;
constexpr char kPrinterClass[] = "07";

// The printer devices of the table, in the table's order.  False (with the
// error set) when the table exists but cannot be read; a missing table lists
// no device: it is gone after every restart until a printer is plugged in.
bool ListDevices(uint32_t uKindMask, std::vector<std::string> *pNames) {
    std::string text;
    switch (ReadTextFile(kUsbTable, &text)) {
        case ReadResult::kMissing:
            return true;
        case ReadResult::kFailed:
            SetError(kErrRead, kUnit, __LINE__);
            return false;
        case ReadResult::kOk:
            break;
    }
    if ((uKindMask & XAVOUSB_KIND_PRINTER_MASK) == 0) return true;
    // A name set twice is listed once, where it first appears; the set of
    // names seen keeps a long table linear.
    std::unordered_set<std::string_view> seen;
    seen.reserve(static_cast<size_t>(std::count(text.begin(), text.end(), '\n')) + 1);
    for (std::string_view rest = text; !rest.empty();) {
        auto kv = ParseKeyValueLine(NextLine(&rest));
        if (!kv || kv->key.substr(0, 2) != kDevicePrefix) continue;
        if (seen.insert(kv->key).second) pNames->emplace_back(kv->key);
    }
    return true;
}

// One sysfs attribute, without its newline.
bool ReadAttribute(const std::string &dir, const char *szName, std::string *pValue) {
    std::string path = dir + "/" + szName;
    if (ReadTextFile(path.c_str(), pValue) != ReadResult::kOk) return false;
    if (!pValue->empty() && pValue->back() == '\n') pValue->pop_back();
    return true;
}

bool ParseHexId(const std::string &text, uint32_t *pId) {
    if (text.empty() || text.size() > 4) return false;
    char *end = nullptr;
    unsigned long v = std::strtoul(text.c_str(), &end, 16);
    if (*end != '\0') return false;
    *pId = static_cast<uint32_t>(v);
    return true;
}

}  // namespace

// First call (no buffer, size 0): stores the bytes needed and returns the
// device count.  Second call: fills the block with the array of name
// pointers (closed by a null pointer) followed by the names, and returns the
// count.  -1 with the last error set on failure, also when the block is too
// small because the table grew between the two calls.
XAVO_PLATFORM_API int32_t XAVOUSBDevEnum(uint32_t uKindMask, void *pBuf, int32_t cbBuf, int32_t *pcbNeeded) {
    if (XAVO_INJECTED()) return -1;
    if (pcbNeeded == nullptr || cbBuf < 0 || (pBuf == nullptr && cbBuf != 0)) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        std::vector<std::string> names;
        if (!ListDevices(uKindMask, &names)) return int32_t{-1};
        // The null pointer that closes the array makes the block never
        // empty, so a caller's zeroed allocation of it always succeeds.
        size_t need = (names.size() + 1) * sizeof(char *);
        for (const std::string &n : names) need += n.size() + 1;
        if (need > static_cast<size_t>(INT32_MAX)) {
            SetError(kErrOutOfMemory, kUnit, __LINE__);
            return int32_t{-1};
        }
        *pcbNeeded = static_cast<int32_t>(need);
        if (pBuf == nullptr) return static_cast<int32_t>(names.size());
        if (static_cast<size_t>(cbBuf) < need) {
            SetError(kErrBufTooSmall, kUnit, __LINE__);
            return int32_t{-1};
        }
        auto **apsz = static_cast<char **>(pBuf);
        char *text = static_cast<char *>(pBuf) + (names.size() + 1) * sizeof(char *);
        for (size_t i = 0; i < names.size(); ++i) {
            apsz[i] = text;
            std::memcpy(text, names[i].c_str(), names[i].size() + 1);
            text += names[i].size() + 1;
        }
        apsz[names.size()] = nullptr;
        return static_cast<int32_t>(names.size());
    });
}

// Fills the record from sysfs: /sys/class/usbmisc/<dev> links to
// .../<usb device>/<interface>/usbmisc/<dev>; the interface directory holds
// the interface class, its parent (the USB device) the IDs and strings.
XAVO_PLATFORM_API int32_t XAVOUSBDevGetInfo(const char *szDevName, XAVOUSBDevInfo *pInfo) {
    if (XAVO_INJECTED()) return -1;
    if (szDevName == nullptr || pInfo == nullptr) {
        SetError(kErrBadParameters, kUnit, __LINE__);
        return -1;
    }
    return XAVO_GUARD(int32_t{-1}, [&] {
        // "lp0" and "/dev/usb/lp0" name the same device.
        const char *slash = std::strrchr(szDevName, '/');
        std::string dev = slash != nullptr ? slash + 1 : szDevName;
        if (dev.empty() || dev == "." || dev == "..") {
            SetError(kErrBadParameters, kUnit, __LINE__);
            return int32_t{-1};
        }
        std::string link = kUsbmiscDir + dev;
        char real[PATH_MAX];
        if (::realpath(link.c_str(), real) == nullptr) {
            SetError(kErrNotFound, kUnit, __LINE__);
            return int32_t{-1};
        }
        std::string interface = DirName(DirName(real));
        std::string device = DirName(interface);
        std::string cls, vendor, product;
        uint32_t uVendor = 0, uProduct = 0;
        if (!ReadAttribute(interface, "bInterfaceClass", &cls) || !ReadAttribute(device, "idVendor", &vendor) ||
            !ReadAttribute(device, "idProduct", &product) || !ParseHexId(vendor, &uVendor) ||
            !ParseHexId(product, &uProduct)) {
            SetError(kErrRead, kUnit, __LINE__);
            return int32_t{-1};
        }
        // Devices without these strings simply have none.
        std::string manufacturer, productName, serial;
        ReadAttribute(device, "manufacturer", &manufacturer);
        ReadAttribute(device, "product", &productName);
        ReadAttribute(device, "serial", &serial);

        pInfo->uKind = cls == kPrinterClass ? kKindPrinter : 0;
        pInfo->uVendorId = uVendor;
        pInfo->uProductId = uProduct;
        CopyValue(manufacturer, pInfo->szManufacturer, sizeof pInfo->szManufacturer);
        CopyValue(productName, pInfo->szProduct, sizeof pInfo->szProduct);
        CopyValue(serial, pInfo->szSerial, sizeof pInfo->szSerial);
        // The appliance names a printer by vendor, product and serial; a
        // device without a serial number gets no name from us.
        pInfo->szPrinterId[0] = '\0';
        if (pInfo->szSerial[0] != '\0') {
            snprintf(pInfo->szPrinterId, sizeof pInfo->szPrinterId, "%04x:%04x:%s", uVendor, uProduct,
                     pInfo->szSerial);
        }
        return int32_t{0};
    });
}
