#include "demo/stage.h"

#include <unistd.h>

#include "demo/walk.h"
#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"

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

namespace {

std::vector<xavo::test::SnmpValue> SocketPrinterValues() {
    return {{".1.1.0", "integer", "7"}, {".1.2.0", "octet_str", kNetDeviceId}, {".1.3.0", "octet_str", kNetUri}};
}

}  // namespace

// The peers start in the order of the members; the daemon that announces
// the IPP printer's services maps its own host name to the printer's
// address (see ipp_printer.h).
Stage::Stage()
    : snmp_(kNetIp, SocketPrinterValues()),
      socketPrinter_(kNetPort),
      avahi_({}, xavo::test::IppPrinter::kIpv4) {
    Say("Started: cupsd (pid " + std::to_string(xavo::test::Cupsd::Pid()) + "), a USB printer ACME Model 100 on " +
        kUsbDev + " (bus " + kUsbBus + "),");
    Say(std::string("a network printer ACME Laser 5 on ") + kNetIp + " (snmpd answering for it, port " +
        std::to_string(socketPrinter_.Port()) + " receiving its jobs),");
    Say(std::string("and an IPP printer ") + xavo::test::IppPrinter::kMake + " " + xavo::test::IppPrinter::kModel +
        " on " + kMdnsIp + " (ippeveprinter, pid " + std::to_string(ippPrinter_.pid()) +
        ") that only avahi-daemon announces.");
}

std::string Stage::Missing() const {
    std::string missing;
    if (xavo::test::Cupsd::Pid() <= 0) missing += " cupsd";
    if (!snmp_.running()) missing += " snmpd";
    if (socketPrinter_.Port() != kNetPort) missing += " the socket printer's port 9100";
    if (!avahi_.ready()) missing += " avahi-daemon";
    if (!ippPrinter_.ready()) missing += " ippeveprinter (announced by mDNS)";
    if (access(kBjnpBackend, X_OK) != 0) missing += std::string(" ") + kBjnpBackend;
    return missing;
}

std::string Stage::MdnsLogs() {
    return "avahi-daemon:\n" + xavo::test::AvahiResponder::DaemonLog() + "ippeveprinter:\n" +
           xavo::test::IppPrinter::Log();
}

}  // namespace xavo::demo
