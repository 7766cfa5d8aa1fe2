// The appliance the walk-through runs on: its printers and the peers that
// stand for them inside the sandbox.
#pragma once

#include <cstdint>

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
// Starts cupsd, plugs the USB printer in and places what the peers' clients
// need.
void SetTheStage();

}  // namespace xavo::demo
