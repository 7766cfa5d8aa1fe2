// The USB and printer helper stand-ins (libxavousb, libxavoprintergpl):
// the printers of the USB table and their information from sysfs.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"
#include "xavocore.h"
#include "xavoprintergpl.h"
#include "xavousb.h"

using xavo::test::PlaceFile;
using xavo::test::PlugUsbDevice;

namespace {

constexpr uint32_t kPrinters = 12;

// Both calls of the enumeration, as the printer library makes them.
std::vector<std::string> Enumerate(int32_t *pcbNeeded = nullptr) {
    int32_t cb = 0;
    EXPECT_GE(XAVOUSBDevEnum(kPrinters, nullptr, 0, &cb), 0);
    EXPECT_GT(cb, 0) << "a block is always needed";
    void *block = std::calloc(1, static_cast<size_t>(cb));
    int32_t n = XAVOUSBDevEnum(kPrinters, block, cb, &cb);
    std::vector<std::string> names;
    auto **items = static_cast<char **>(block);
    for (int32_t i = 0; i < n; ++i) {
        EXPECT_GE(items[i], static_cast<char *>(block));
        EXPECT_LT(items[i], static_cast<char *>(block) + cb) << "names lie in the block";
        names.emplace_back(items[i]);
    }
    std::free(block);
    if (pcbNeeded != nullptr) *pcbNeeded = cb;
    return names;
}

TEST(PlatformUsb, EnumeratesThePrinterKeysOfTheTable) {
    EXPECT_TRUE(Enumerate().empty()) << "no table after a restart: no printer";
    PlaceFile("/tmp/usbtab", "lp1=\"1-2\"\n# lp9=\"x\"\nusb0=\"1-3\"\nlp0=\"1-1.2\"\n\nlp1=\"1-4\"\n");
    EXPECT_EQ(Enumerate(), (std::vector<std::string>{"lp1", "lp0"}));
    int32_t cb = 0;
    EXPECT_EQ(XAVOUSBDevEnum(0x01, nullptr, 0, &cb), 0) << "no printer kind asked for";
}

TEST(PlatformUsb, BlockTooSmallForAGrownTableFails) {
    PlaceFile("/tmp/usbtab", "lp0=\"1-1\"\n");
    int32_t cb = 0;
    ASSERT_EQ(XAVOUSBDevEnum(kPrinters, nullptr, 0, &cb), 1);
    PlaceFile("/tmp/usbtab", "lp0=\"1-1\"\nlp1=\"1-2\"\n");
    std::vector<char> block(static_cast<size_t>(cb));
    EXPECT_LT(XAVOUSBDevEnum(kPrinters, block.data(), cb, &cb), 0);
    EXPECT_EQ(ORLICErrGet(), 0x0100u);
}

// The IDs, strings and printer ID of a plugged printer are pinned through
// the USB plug-in tests; here both name forms, the cut, other interface
// classes, a device without serial number and the failures.
TEST(PlatformUsb, DeviceInformationComesFromSysfs) {
    PlugUsbDevice({.manufacturer = std::string(200, 'M')});
    PlugUsbDevice({.devName = "lp1", .busId = "1-2", .serial = "", .interfaceClass = 3});
    XAVOUSBDevInfo info;
    for (const char *name : {"lp0", "/dev/usb/lp0"}) {
        std::memset(&info, 0, sizeof info);
        ASSERT_EQ(XAVOUSBDevGetInfo(name, &info), 0) << name;
        EXPECT_EQ(info.uKind, 0x04u);
        EXPECT_EQ(info.szManufacturer, std::string(127, 'M')) << "cut to fit";
        EXPECT_STREQ(info.szPrinterId, "04b8:0005:SN0001");
    }
    ASSERT_EQ(XAVOUSBDevGetInfo("lp1", &info), 0);
    EXPECT_EQ(info.uKind & XAVOUSB_KIND_PRINTER_MASK, 0u) << "not a printer interface";
    EXPECT_STREQ(info.szPrinterId, "") << "no serial, no printer ID";

    EXPECT_LT(XAVOUSBDevGetInfo("lp2", &info), 0);
    EXPECT_EQ(ORLICErrGet(), 0x2600u);
    PlaceFile("/sys/devices/pci0000:00/0000:00:14.0/usb1/1-1/idVendor", "zz\n");
    EXPECT_LT(XAVOUSBDevGetInfo("lp0", &info), 0);
    EXPECT_EQ(ORLICErrGet(), 0x0A00u);
}

TEST(PlatformPrinterHelper, ReadsTheStoredDeviceIdString) {
    PlaceFile("/usr/xavo/etc/printer.conf",
              "[04b8:0005:SN0001]\n\tusblp string id = MFG:ACME;MDL:Model 100;\n[other]\n\tproducer = X\n");
    char buf[4096];
    ASSERT_EQ(XAVOPrinterGPLConfStringIdGet("04b8:0005:SN0001", buf, sizeof buf), 0);
    EXPECT_STREQ(buf, "MFG:ACME;MDL:Model 100;");
    EXPECT_NE(XAVOPrinterGPLConfStringIdGet("other", buf, sizeof buf), 0);
    EXPECT_NE(XAVOPrinterGPLConfStringIdGet("missing", buf, sizeof buf), 0);
}

}  // namespace
