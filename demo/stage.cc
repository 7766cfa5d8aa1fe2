#include "demo/stage.h"

#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "sandbox/snmpd.h"

namespace xavo::demo {

using xavo::test::PlaceProgram;

void SetTheStage() {
    xavo::test::SetRealSleep(true);
    xavo::test::Cupsd::Start();
    PlaceProgram("/usr/lib/cups/backend/usb", kUsbBackend);

    xavo::test::PlugUsbDevice({.devName = kUsbDev, .busId = kUsbBus, .vendor = 0x04b8, .product = 0x0005,
                               .serial = "SN0001", .manufacturer = "ACME", .productName = "Model 100"});
    xavo::test::SetUsblp(kUsbDev, {.deviceIdReply = xavo::test::UsblpReply(kUsbDeviceId)});

    xavo::test::PlaceSnmpClientConfig();
}
}  // namespace xavo::demo
