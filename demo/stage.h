// The appliance the walk-through runs on: its printers and the peers that
// stand for them inside the sandbox, each started by the Stage and stopped
// by its own pid when the Stage goes (cupsd by main(), after the walk).
#pragma once

#include <cstdint>
#include <string>

#include "sandbox/avahi.h"
#include "sandbox/ipp_printer.h"
#include "sandbox/snmpd.h"
#include "sandbox/socket_listener.h"

namespace xavo::demo {

inline constexpr char kUsbDev[] = "lp0";
inline constexpr char kUsbBus[] = "1-1";
inline constexpr char kUsbPrinterId[] = "04b8:0005:SN0001";
inline constexpr char kUsbDeviceId[] = "MFG:ACME;MDL:Model 100;CMD:ESCPL2,PCL;CLS:PRINTER;DES:ACME Model 100;";
// What the USB printer "prints": the CUPS backend for "usb:" URIs below
// appends every job to this file, as the real printer would put it on
// paper.
inline constexpr char kUsbPaper[] = "/tmp/lp0-paper";
inline constexpr char kUsbBackend[] =
    "#!/bin/sh\n"
    "# The appliance's USB backend, for the demo: no arguments lists the\n"
    "# device; a job goes to the file that stands for the printer's paper.\n"
    "if [ $# -eq 0 ]; then echo 'direct usb \"ACME Model 100\" \"USB printer on lp0\"'; exit 0; fi\n"
    "if [ -n \"$6\" ]; then cat \"$6\"; else cat; fi >>/tmp/lp0-paper\n";

inline constexpr char kNetIp[] = "127.0.0.1";
inline constexpr std::uint16_t kNetPort = 9100;
inline constexpr char kNetDeviceId[] = "MFG:ACME;MDL:Laser 5;CMD:PCL,POSTSCRIPT;CLS:PRINTER;";
inline constexpr char kNetUri[] = "socket://127.0.0.1:9100";
inline constexpr char kNetQueueName[] = "office";
// The printer that answers no SNMP and announces itself by mDNS only.
inline constexpr const char *kMdnsIp = xavo::test::IppPrinter::kIpv4;
inline constexpr char kMdnsQueueName[] = "reception";
// An address where nothing answers: SNMP, mDNS and BJNP all come back empty.
inline constexpr char kNobodyIp[] = "127.0.0.3";
// Debian's BJNP backend (cups-backend-bjnp), run by the library as it is:
// the sandbox's /usr is an overlay of the host's, so the installed program
// is there, beside the USB backend the stage places over the real one.
inline constexpr char kBjnpBackend[] = "/usr/lib/cups/backend/bjnp";

// Starts cupsd, plugs the USB printer in and places what the peers' clients
// need; before the Stage.
void SetTheStage();

class Stage {
public:
    Stage();
    Stage(const Stage &) = delete;
    Stage &operator=(const Stage &) = delete;

    // Every peer runs; otherwise what is missing, in words.
    std::string Missing() const;
    // What the mDNS peers said, for when they did not start.
    static std::string MdnsLogs();
    // The documents the network printers received: everything sent to the
    // socket printer; the first document the IPP printer kept.
    std::string SocketPrinterGot(size_t size, int timeoutMs) { return socketPrinter_.WaitForBytes(size, timeoutMs); }
    static std::string IppPrinterGot(size_t size, int timeoutMs) {
        return xavo::test::IppPrinter::WaitForDocument(size, timeoutMs);
    }

private:
    xavo::test::SnmpAgent snmp_;
    xavo::test::SocketListener socketPrinter_;
    // The IPP printer registers with the daemon, so it goes first: members
    // are stopped in the reverse order.
    xavo::test::AvahiResponder avahi_;
    xavo::test::IppPrinter ippPrinter_;
};

}  // namespace xavo::demo
