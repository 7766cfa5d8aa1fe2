// The USB stand-in (libxavousb), for what the USB plug-in and listing tests
// cannot see: where the names of an enumeration lie, a table that grows
// between the two calls of one, a name the table holds twice, and the kind of a device that is no printer.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "sandbox/sandbox.h"
#include "xavocore.h"
#include "xavousb.h"

using xavo::test::PlaceFile;
using xavo::test::PlugUsbDevice;

namespace {

constexpr uint32_t kPrinters = 12;

TEST(PlatformUsb, EnumeratedNamesLieInTheCallersBlockAndAGrownTableIsRefused) {
    // A name set twice is listed once, where it first appears.
    PlaceFile("/tmp/usbtab", "lp1=\"1-2\"\n# lp9=\"x\"\nusb0=\"1-3\"\nlp0=\"1-1.2\"\nlp1=\"1-4\"\n");
    int32_t cb = 0;
    ASSERT_EQ(XAVOUSBDevEnum(kPrinters, nullptr, 0, &cb), 2);
    std::vector<char> block(static_cast<size_t>(cb));
    int32_t cbAfter = 0;
    ASSERT_EQ(XAVOUSBDevEnum(kPrinters, block.data(), cb, &cbAfter), 2);
    auto **items = reinterpret_cast<char **>(block.data());
    std::vector<std::string> names;
    for (int i = 0; i < 2; ++i) {
        EXPECT_GE(items[i], block.data());
        EXPECT_LT(items[i], block.data() + cb) << "the caller frees the block only";
        names.emplace_back(items[i]);
    }
    EXPECT_EQ(names, (std::vector<std::string>{"lp1", "lp0"}));

    PlaceFile("/tmp/usbtab", "lp0=\"1-1\"\nlp1=\"1-2\"\nlp2=\"1-3\"\n");
    EXPECT_LT(XAVOUSBDevEnum(kPrinters, block.data(), cb, &cbAfter), 0);
    EXPECT_EQ(ORLICErrGet(), 0x0100u);
}

TEST(PlatformUsb, KindComesFromTheInterfaceClass) {
    PlugUsbDevice({});
    PlugUsbDevice({.devName = "lp1", .busId = "1-2", .interfaceClass = 3});
    XAVOUSBDevInfo info{};
    ASSERT_EQ(XAVOUSBDevGetInfo("lp0", &info), 0);
    EXPECT_EQ(info.uKind, 0x04u);
    ASSERT_EQ(XAVOUSBDevGetInfo("lp1", &info), 0);
    EXPECT_EQ(info.uKind & XAVOUSB_KIND_PRINTER_MASK, 0u);
    EXPECT_LT(XAVOUSBDevGetInfo("lp2", &info), 0);
    EXPECT_EQ(ORLICErrGet(), 0x2600u);
}

}  // namespace
