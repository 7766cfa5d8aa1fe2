// The injection proof: hostile texts (line breaks, "[section]" lines, "=",
// quotes, 64 KiB strings) through every way outside text reaches the
// library (the usblp device ID, the USB device's sysfs texts, SNMP values
// of the real snmpd, mDNS TXT strings of the real avahi-daemon, the BJNP
// listing, the callers' records), each followed by the calls that write
// what was learned.  Afterwards every file the library writes is read the
// way its readers read it (the rules of Samba's parser, which the
// appliance's platform follows), and every section, key or line that the
// library was not asked to write counts as injected.
#include <gtest/gtest.h>

#include <cstdio>
#include <functional>
#include <future>
#include <string>
#include <vector>

#include "sandbox/avahi.h"
#include "sandbox/cupsd.h"
#include "sandbox/snmpd.h"
#include "support/paths.h"
#include "support/proof_tally.h"
#include "support/records.h"
#include "support/written_files.h"
#include "xavoprinter.h"

using namespace xavo::test;

namespace {

constexpr char kPlain[] = "Plain 1";

struct Payload {
    const char *szName;
    std::string text;
};

std::vector<Payload> Payloads() {
    std::string longBreaks;
    while (longBreaks.size() < 65536) longBreaks += "x\n[INJ]\nINJ = 1\r\nINJ=\"1\"\n";
    return {
        {"plain", kPlain},  // shows that each channel carries text to the files at all
        {"line breaks", "A\n[INJ]\nINJ = 1\nB"},
        {"carriage returns", "A\r\n[INJ]\r\nINJ=1\r"},
        {"section line", "[INJ]"},
        {"closing bracket", "A]\n[INJ"},
        {"equals", "INJ = 1"},
        {"quotes", "\"INJ\"=\"1\" 'x'"},
        {"quote and break", "1\"\nINJ=\"1"},
        {"comment marks", ";INJ\n#INJ = 1"},
        {"64 KiB", std::string(65536, 'A')},
        {"64 KiB of breaks", longBreaks.substr(0, 65536)},
    };
}

template <class... Fields>
void FillAll(const std::string &text, Fields &...fields) {
    (Fill(fields, text), ...);
}

std::string Hex(const std::string &text) {
    std::string out = "0x";
    char sz[3];
    for (unsigned char c : text) {
        std::snprintf(sz, sizeof sz, "%02X", c);
        out += sz;
    }
    return out;
}

const std::string kUsbPrefix = "04b8:0005:";
// Cut as the USB library keeps a serial number and the library forms an ID.
std::string UsbId(const std::string &serial) { return (kUsbPrefix + serial.substr(0, 127)).substr(0, 127); }

// A USB printer on lp0 with its sysfs texts and its device ID, enabled.
Expected PlugAndEnable(const UsbDevice &device, const std::string &deviceId, const std::string &busId = "1-1") {
    if (FileExists("/sys/class/usbmisc/lp0")) UnplugUsbDevice("lp0");
    PlugUsbDevice(device);
    SetUsblp("lp0", {.deviceIdReply = UsblpReply(deviceId.substr(0, 65533))});
    XAVOPrinterEnableExt(1, "lp0", busId.c_str());
    return Expected::Usb(UsbId(device.serial));
}

// What the appliance does with an identified network printer: the record
// from what identification found, its section and its table line.
Expected Register(const NetPrinterInfo &info, const char *szIP) {
    NetPrinterConf conf = NetRecord(szIP, "office", info.szBackend, info.szQName);
    Fill(conf.szBrand, info.szBrand);
    Fill(conf.szModel, info.szModel);
    Fill(conf.szStringId, info.szStringId);
    XAVOPrinterNetConfSetup(&conf, 0);
    XAVOPrinterNetUpdateConf(1, &conf);
    return Expected::Net(conf.szPrinterId, conf.szIP);
}

// A caller's USB printer record: every field but the printer ID is szText.
const std::string kRecordId = "04b8:0005:REC";
Expected SetUpUsbRecord(const std::string &id, const std::string &text) {
    UsbPrinterConf conf = UsbRecord(id.c_str());
    FillAll(text, conf.szMode, conf.szProducer, conf.szDriverBrand, conf.szDriver, conf.szManualLockTimer,
            conf.szAutoLockTimer, conf.szProductName, conf.szEnableAirprint, conf.szEnableGoogleCloudPrint,
            conf.szUsblpStringId, conf.szFitToPage);
    XAVOPrinterConfSetup(&conf, 1);
    return Expected::Usb(conf.szPrinterId);
}

// A caller's network printer record: address and ID as given, every other
// field szText.
Expected SetUpNetRecord(const std::string &ip, const std::string &id, const std::string &text) {
    NetPrinterConf conf = NetRecord();
    Fill(conf.szIP, ip);
    Fill(conf.szPrinterId, id);
    FillAll(text, conf.szCupsPrinterName, conf.szBackend, conf.szQName, conf.szBrand, conf.szModel,
            conf.szDriverBrand, conf.szDriver, conf.szEnableAirprint, conf.szEnableGoogleCloudPrint, conf.szStringId,
            conf.szFitToPage);
    XAVOPrinterNetConfSetup(&conf, 1);
    XAVOPrinterNetUpdateConf(1, &conf);
    return Expected::Net(conf.szPrinterId, conf.szIP);
}

std::string SnmpAddress(size_t i) { return "127.0.0." + std::to_string(20 + i); }
std::string MdnsAddress(size_t i) { return "127.0.0." + std::to_string(60 + i); }

// snmpd.conf lines hold about 1 KiB, mDNS TXT strings 255 bytes: those
// channels carry the first part of a long payload.
constexpr size_t kSnmpPart = 400;
constexpr size_t kTxtPart = 200;

// The real peers, each printer's values carrying one payload: an SNMP
// agent per payload, and one mDNS responder announcing a printer per
// payload.
struct NetworkPeers {
    explicit NetworkPeers(const std::vector<Payload> &payloads) {
        PlaceSnmpClientConfig();
        std::vector<MdnsPrinter> printers;
        for (size_t i = 0; i < payloads.size(); ++i) {
            const std::string p = payloads[i].text.substr(0, kSnmpPart);
            agents.push_back(std::make_unique<SnmpAgent>(
                SnmpAddress(i),
                std::vector<SnmpValue>{{".1.2.0", "octet_str", Hex("MFG:ACME" + p + ";MDL:M" + p + ";")},
                                       {".1.3.0", "octet_str", Hex("socket://h/" + p)}}));
            const std::string t = payloads[i].text.substr(0, kTxtPart);
            printers.push_back({"inj" + std::to_string(i), MdnsAddress(i), "Injected " + std::to_string(i),
                                {{"_pdl-datastream._tcp", 9100, {"usb_MFG=" + t, "usb_MDL=" + t, "usb_CMD=" + t}}}});
        }
        avahi = std::make_unique<AvahiResponder>(printers);
    }
    bool ready() const {
        bool bReady = avahi->ready();
        for (const auto &agent : agents) bReady = bReady && agent->running();
        return bReady;
    }
    std::vector<std::unique_ptr<SnmpAgent>> agents;
    std::unique_ptr<AvahiResponder> avahi;
};

// What the mDNS lookup learned of each payload's printer.  Every browse
// takes the daemon's second: all of them at once.
std::vector<NetPrinterInfo> BrowseAll(size_t n) {
    std::vector<std::future<NetPrinterInfo>> browsed;
    for (size_t i = 0; i < n; ++i) {
        browsed.push_back(std::async(std::launch::async, [i] {
            NetPrinterInfo info{};
            XAVOPrinterNetAvahiInfoGet(MdnsAddress(i).c_str(), &info);
            return info;
        }));
    }
    std::vector<NetPrinterInfo> infos;
    for (auto &f : browsed) infos.push_back(f.get());
    return infos;
}

// Each channel: the calls that carry payload i to the files, and whether
// the plain payload must then show in them (secrets are enciphered, and the
// USB/IP hooks write nothing).
struct Channel {
    const char *szName;
    std::function<Expected(size_t, const std::string &)> run;
    bool bShowsText = true;
};

std::vector<Channel> Channels(const std::vector<NetPrinterInfo> &mdnsInfo) {
    return {
        {"usblp device ID",
         [](size_t, const std::string &p) { return PlugAndEnable({}, "MFG:A" + p + ";MDL:M" + p + ";"); }},
        {"sysfs serial", [](size_t, const std::string &p) { return PlugAndEnable({.serial = p}, "MFG:A;MDL:M;"); }},
        {"sysfs manufacturer", [](size_t, const std::string &p) { return PlugAndEnable({.manufacturer = p}, ""); }},
        {"sysfs product", [](size_t, const std::string &p) { return PlugAndEnable({.productName = p}, ""); }},
        {"SNMP values", [](size_t i, const std::string &) {
             NetPrinterInfo info{};
             XAVOPrinterNetInfoGetByIP(SnmpAddress(i).c_str(), &info);
             return Register(info, SnmpAddress(i).c_str());
         }},
        {"mDNS TXT",
         [&mdnsInfo](size_t i, const std::string &) { return Register(mdnsInfo[i], MdnsAddress(i).c_str()); }},
        {"BJNP listing", [](size_t, const std::string &p) {
             PlaceFile("/tmp/bjnp.listing", "network bjnp://10.0.0.1:8611 \"Canon " + p + "\" \"Canon " + p +
                                                " 10.0.0.1\" \"MFG:Canon" + p + ";MDL:M" + p + ";\"\n");
             PlaceProgram("/usr/lib/cups/backend/bjnp", "#!/bin/sh\ncat /tmp/bjnp.listing\n");
             NetPrinterInfo info{};
             XAVOPrinterNetBjnpInfoGet("10.0.0.1", &info);
             return Register(info, "10.0.0.1");
         }},
        {"USB record", [](size_t, const std::string &p) { return SetUpUsbRecord(kRecordId, p); }},
        {"USB record printer ID", [](size_t, const std::string &p) { return SetUpUsbRecord(p, kPlain); }},
        {"network record", [](size_t, const std::string &p) { return SetUpNetRecord("10.0.0.9", "10.0.0.9-rec", p); }},
        {"network record address and ID", [](size_t, const std::string &p) { return SetUpNetRecord(p, p, kPlain); }},
        {"cloud print record", [](size_t, const std::string &p) {
             const PrinterGoogleInfo info = CloudRecord(p.c_str(), p.c_str(), p.c_str());
             XAVOPrinterGoogleInfoSet(&info);
             return Expected{{{"Google Cloud Print", &kCloudSectionKeys}}, {}, {}};
         }, false},
        {"bus ID", [](size_t, const std::string &p) { return PlugAndEnable({}, "MFG:A;MDL:M;", p); }},
        {"device name", [](size_t, const std::string &p) {
             XAVOPrinterEnableExt(1, p.c_str(), "1-1");
             return Expected{{}, {}, {p}};
         }},
        {"queue printer ID", [](size_t, const std::string &p) {
             // Registered where the platform takes the name, so that the
             // queue's name is written under it.
             ORLICSzHash *hash = ORLICSzHashAlloc(8);
             ORLICSzHashSetValue(&hash, "mode", "usbip");
             ORLICFileAddSection(kConf, p.c_str(), hash, "\t%s = %s\n");
             ORLICSzHashFree(hash);
             XAVOPrinterCupsAdd(p.c_str(), nullptr);
             return Expected::Usb(p);
         }},
        {"USB/IP printer ID", [](size_t, const std::string &p) {
             char szBuf[64];
             XAVOPrinterUsbipEject(p.c_str());
             XAVOPrinterUsbipLockRelease(p.c_str());
             XAVOPrinterUsbipGetLockStatus(p.c_str(), szBuf, sizeof szBuf);
             XAVOPrinterQueueGet(p.c_str(), szBuf, sizeof szBuf);
             return Expected{};
         }, false},
    };
}

// A real scheduler answers the queue list that queue creation reads;
// lpadmin, cupsdisable and the USB/IP service's bind_driver only succeed,
// since only the appliance's files are looked at.  Stopped on every path.
class ProofInjection : public ::testing::Test {
protected:
    void SetUp() override {
        Cupsd::Start();
        PlaceProgram("/usr/bin/lpadmin", "#!/bin/sh\nexit 0\n");
        PlaceProgram("/usr/bin/cupsdisable", "#!/bin/sh\nexit 0\n");
        PlaceProgram("/usr/bin/bind_driver", "#!/bin/sh\nexit 0\n");
    }
    void TearDown() override { Cupsd::Stop(); }
};

}  // namespace

TEST_F(ProofInjection, NoSectionKeyOrLineOfOutsideTextInAnyFileTheLibraryWrites) {
    const std::vector<Payload> payloads = Payloads();
    NetworkPeers peers(payloads);
    ASSERT_TRUE(peers.ready()) << AvahiResponder::DaemonLog();
    const std::vector<NetPrinterInfo> mdnsInfo = BrowseAll(payloads.size());

    Tally tally{"injection"};
    for (const Channel &channel : Channels(mdnsInfo)) {
        for (size_t i = 0; i < payloads.size(); ++i) {
            ClearWrittenFiles();
            const std::vector<std::string> found = Injections(channel.run(i, payloads[i].text));
            if (payloads[i].text == kPlain && channel.bShowsText) {
                const std::string written = ReadFile(kConf) + ReadFile(kNptab) + ReadFile(kUsbtab);
                EXPECT_NE(written.find(kPlain), std::string::npos) << channel.szName << " carried nothing";
            }
            tally.Check(found.empty(), std::string(channel.szName) + " / " + payloads[i].szName + ": " +
                                           (found.empty() ? "" : found.front()));
        }
    }
}
