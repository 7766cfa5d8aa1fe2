// Records the fuzz targets' seed corpora from the real tools, run inside
// the appliance sandbox against real peers: a private cupsd with queues and
// held jobs (lpstat -v, lpq), snmpd agents answering as printers
// (snmpwalk), avahi-daemon announcing printers (avahi-browse), ping on
// loopback, Debian's BJNP backend, and the printer configuration files as
// the library itself writes them.  Run by "scripts/fuzz.sh --record" with
// the corpus directory as its argument; each seed is one file named after
// what it holds.  Inputs are laid out as each target reads them (see the
// comment at the top of fuzz/<target>_fuzz.cc).  Seeds named "edge-*" are
// written by hand: cases a fuzz run once stopped at, kept as they were.
#include <cstddef>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "sandbox/avahi.h"
#include "sandbox/cupsd.h"
#include "sandbox/sandbox.h"
#include "sandbox/snmpd.h"
#include "xavoprinter.h"

namespace {

using namespace xavo::test;

std::string g_out;

void Seed(const std::string &target, const std::string &name, const std::string &bytes) {
    const std::string dir = g_out + "/" + target;
    std::filesystem::create_directories(dir);
    std::ofstream file(dir + "/" + name, std::ios::binary | std::ios::trunc);
    if (!(file << bytes).flush()) throw std::runtime_error("cannot write " + dir + "/" + name);
    std::printf("%s/%s: %zu bytes\n", target.c_str(), name.c_str(), bytes.size());
}

// ---- CUPS: lpstat -v and lpq -----------------------------------------------
void RecordCups() {
    Cupsd::Start();
    const std::vector<std::pair<std::string, std::string>> queues = {
        {"usbprinter1", "usb:/dev/usb/04b8:0005:X2Y7Z"},
        {"usbprinter", "usb:/dev/usb/04b8:0005:X2Y7Z"},
        {"office", "socket://10.0.0.5/office"},
        {"lab", "lpd://192.168.1.20/raw"},
        {"colour", "ipp://10.0.0.7/ipp/print"},
        {"canon", "bjnp://10.0.0.9:8611"},
    };
    for (const auto &[name, uri] : queues) Tool({"/usr/sbin/lpadmin", "-p", name, "-v", uri, "-E"});
    const std::string list = Tool({"/usr/bin/lpstat", "-v"});
    Seed("lpstat_lines", "queues", "10.0.0.5\n" + list);
    Seed("tool_lines", "lpstat", std::string("\xff") + list);
    Seed("lpstat_lines", "queues-other-address", "192.168.1.2\n" + Tool({"/usr/bin/lpstat", "-v"}));

    // Jobs stay listed on a disabled queue.
    Tool({"/usr/sbin/cupsdisable", "office"});
    PlaceFile("/tmp/report.txt", "quarterly report\n");
    PlaceFile("/tmp/a file with blanks.txt", "x\n");
    Seed("lpq_lines", "empty-queue", "1\n" + Tool({"/usr/bin/lpq", "-P", "office"}));
    for (int i = 0; i < 3; ++i) Tool({"/usr/bin/lpr", "-P", "office", "/tmp/report.txt"});
    Tool({"/usr/bin/lpr", "-P", "office", "-T", "a title", "/tmp/a file with blanks.txt"});
    Seed("lpq_lines", "jobs", "2\n" + Tool({"/usr/bin/lpq", "-P", "office"}));
    Seed("lpq_lines", "jobs-gone", "77\n" + Tool({"/usr/bin/lpq", "-P", "office"}));
    Seed("lpq_lines", "unknown-queue", "1\n" + Tool({"/usr/bin/lpq", "-P", "nosuchqueue"}));
    Cupsd::Stop();
}

// ---- SNMP: snmpwalk of a printer's enterprises subtree ----------------------
void RecordSnmp() {
    PlaceSnmpClientConfig();
    struct Agent {
        const char *szName;
        std::vector<SnmpValue> values;
    };
    const std::vector<Agent> agents = {
        {"device-id", {{".1.1.0", "octet_str", "MFG:ACME;MDL:LX 100;CMD:PCL,PJL,POSTSCRIPT;CLS:PRINTER;"}}},
        {"device-id-long-keys",
         {{".1.1.0", "integer", "7"},
          {".1.2.0", "octet_str", "MANUFACTURER:Hewlett-Packard;COMMAND SET:PJL,PML,PCLXL;MODEL:LaserJet 400;"}}},
        {"uri-lpr", {{".2.1.0", "octet_str", "lpr://127.0.0.2/queue1"}, {".2.2.0", "integer", "515"}}},
        {"uri-socket", {{".2.1.0", "octet_str", "socket://127.0.0.2:9100"}}},
        {"uri-ipp-and-id",
         {{".1.1.0", "octet_str", "MFG:Brother;MDL:HL-L2350DW;CMD:PJL,PCL,PCLXL,URF;"},
          {".3.1.0", "octet_str", "ipp://127.0.0.2/ipp/print"}}},
        {"no-device-id", {{".4.1.0", "octet_str", "Office printer, 2nd floor"}, {".4.2.0", "integer", "3"}}},
    };
    for (const Agent &a : agents) {
        SnmpAgent agent("127.0.0.2", a.values);
        Seed("snmp_lines", a.szName,
             Tool({"/usr/bin/snmpwalk", "-v", "1", "-c", "public", "127.0.0.2", "enterprises"}));
    }
    // No agent: the tool prints nothing on its output.
    Seed("snmp_lines", "no-agent", Tool({"/usr/bin/snmpwalk", "-v", "1", "-c", "public", "127.0.0.9", "enterprises"}));
}

// ---- mDNS: avahi-browse -arpt -------------------------------------------------
void RecordAvahi() {
    AvahiResponder avahi({
        {"laser", "127.0.0.1", "Office Laser",
         {{"_ipp._tcp", 631, {"txtvers=1", "usb_MFG=ACME", "usb_MDL=Laser 100", "usb_CMD=PCL,PJL"}},
          {"_pdl-datastream._tcp", 9100, {"usb_MFG=ACME", "usb_MDL=Laser 100"}}}},
        {"canon", "127.0.0.11", "Canon MX920 series",
         {{"_canon-bjnp1._tcp", 8611, {"usb_CMD=BJL,BJRaster3", "usb_MFG=Canon"}},
          {"_printer._tcp", 515, {"usb_MFG=Canon", "usb_MDL=MX920 series", "note=Hall; by the door"}}}},
        {"bare", "127.0.0.12", "No TXT", {{"_ipp._tcp", 631, {}}}},
    });
    if (!avahi.ready()) {
        std::fprintf(stderr, "avahi-daemon did not come up:\n%s\n", AvahiResponder::DaemonLog().c_str());
        return;
    }
    Seed("avahi_lines", "printers", Tool({AvahiResponder::kBrowsePath, "-arpt"}));
}

// ---- ping ---------------------------------------------------------------
void RecordPing() {
    Seed("ping_lines", "reachable", Tool({"/bin/ping", "-w", "1", "127.0.0.1"}));
    // An address routed out of loopback that nothing answers: total loss.
    Tool({"/sbin/ip", "route", "add", "10.9.0.0/24", "dev", "lo"});
    Seed("ping_lines", "unreachable", Tool({"/bin/ping", "-w", "1", "10.9.0.5"}));
    Seed("ping_lines", "reachable-three", Tool({"/bin/ping", "-c", "3", "-i", "0.2", "127.0.0.1"}));
}

// ---- BJNP: the backend's device listing --------------------------------------
void RecordBjnp() {
    // The sandbox's network holds no BJNP printer: the backend lists its
    // generic entry only.  Lines for printers it found follow the backend's
    // own format (scheme, URI, make and model, info, device ID).
    const std::string listing = Tool({"/usr/lib/cups/backend/bjnp"});
    Seed("bjnp_lines", "no-printer", "10.0.0.5\n" + listing);
    const std::string found =
        "network bjnp://10.0.0.5:8611 \"Canon MX920 series\" \"Canon MX920 series 10.0.0.5\" "
        "\"MFG:Canon;CMD:BJL,BJRaster3,BSCCe,IVEC,IVECPLI;SOJ:BJNP2,BJNPe;MDL:MX920 series;CLS:PRINTER;DES:Canon MX920 "
        "series;VER:1.070;STA:10;FSI:03;HRI:2;MSI:E3;PDS:1;CID:CA_IVEC_A4;\"\n"
        "network bjnp://10.0.0.15:8611 \"Canon TS5000 series\" \"Canon TS5000 series 10.0.0.15\" "
        "\"MFG:Canon;CMD:BJL,BJRaster3,IVEC;MDL:TS5000 series;CLS:PRINTER;\"\n";
    Seed("bjnp_lines", "printers", "10.0.0.5\n" + listing + found);
    Seed("bjnp_lines", "unidentified", "10.0.0.5\nnetwork bjnp://10.0.0.5:8611 \"Unidentified printer\" \"\" \"\"\n");
}

// ---- device ID strings --------------------------------------------------------
const std::vector<std::pair<std::string, std::string>> kDeviceIds = {
    {"acme", "MFG:ACME;MDL:LX 100;CMD:PCL,PJL,POSTSCRIPT;CLS:PRINTER;"},
    {"hp", "MFG:Hewlett-Packard;CMD:PJL,PML,PCLXL,POSTSCRIPT,PCL;MDL:HP LaserJet 400 M401dne;CLS:PRINTER;"
           "DES:Hewlett-Packard LaserJet 400 M401dne;MEM:MEM=126MB;COMMAND SET:PJL,PCLXL;"},
    {"epson", "MFG:EPSON;CMD:ESCPL2,BDC,D4,D4PX,ESCPR1;MDL:ET-2750 Series;CLS:PRINTER;DES:EPSON ET-2750 Series;"
              "CID:EpsonRGB;FID:FXN,DPN,WFA,ETN,AFN,DAN,WRA;RID:40;DDS:022500;ELG:1000;SN:583650434E303133;"},
    {"long-keys", "MANUFACTURER:Brother;COMMAND SET:PJL,PCL,PCLXL;MODEL:HL-L2350DW series;CLASS:PRINTER;"},
    {"no-final-semicolon", "MFG:Canon;MDL:MX920 series"},
    {"mdns-built", "MFG:ACME;CMD:PCL,PJL;MDL:Laser 100;CLS:PRINTER;DES:ACME Laser 100;"},
};

void RecordDeviceIds() {
    for (const auto &[name, id] : kDeviceIds) {
        Seed("device_id_pairs", name, id);
        // Key choice (the model's "MDL:", the vendor's "MFG:"), buffer size, text.
        Seed("device_id_key", name + "-mdl", std::string("\x04\x7f", 2) + id);
        Seed("device_id_key", name + "-mfg-cut", std::string("\x01\x03", 2) + id);
    }
}

// ---- section and key-value files as the library writes them --------------------
// FuzzedDataProvider's strings: "\\" stands for a backslash, and a
// backslash before any other character ends the string.
std::string Str(const std::string &text) {
    std::string out;
    for (char c : text) out += c == '\\' ? std::string("\\\\") : std::string(1, c);
    return out + "\\;";
}

// A record's text field and what it is filled with: both records are
// filled by one helper, each field once.
struct FieldText {
    char *sz;
    size_t cb;
    std::string text;
};
template <size_t N>
FieldText Field(char (&field)[N], std::string text) {
    return {field, N, std::move(text)};
}
void Fill(std::initializer_list<FieldText> fields) {
    for (const FieldText &f : fields) std::snprintf(f.sz, f.cb, "%s", f.text.c_str());
}

void RecordFiles() {
    UsbPrinterConf usb{};
    Fill({Field(usb.szPrinterId, "04b8:0005:X2Y7Z"), Field(usb.szProducer, "EPSON"),
          Field(usb.szProductName, "ET-2750 Series"), Field(usb.szMode, "lpr"),
          Field(usb.szUsblpStringId, kDeviceIds[2].second), Field(usb.szEnableAirprint, "1")});
    XAVOPrinterConfSetup(&usb, 0);
    NetPrinterConf net{};
    Fill({Field(net.szIP, "10.0.0.5"), Field(net.szCupsPrinterName, "office"), Field(net.szBackend, "socket"),
          Field(net.szQName, "office"), Field(net.szBrand, "ACME"), Field(net.szModel, "LX 100"),
          Field(net.szStringId, kDeviceIds[0].second), Field(net.szPrinterId, "10.0.0.5-office")});
    XAVOPrinterNetConfSetup(&net, 0);
    XAVOPrinterNetUpdateConf(1, &net);

    const std::string conf = ReadFile("/usr/xavo/etc/printer.conf");
    const std::string smb = ReadFile("/etc/samba/smb.reserved.conf");
    const std::string nptab = ReadFile("/usr/xavo/etc/nptab");
    // Section targets: name, pairs, the file; then the pair count and the
    // operation (0 add, 1 replace, 2 set one key), read from the end.
    Seed("section_file", "replace-usb",
         Str("04b8:0005:X2Y7Z") + Str("mode") + Str("usbip") + Str("cups printer name") + Str("usbprinter1") + conf +
             std::string("\x02\x01", 2));
    Seed("section_file", "add-net",
         Str("10.0.0.7-colour") + Str("IP") + Str("10.0.0.7") + Str("Backend") + Str("ipp") + conf +
             std::string("\x02\x00", 2));
    Seed("section_file", "set-key", Str("10.0.0.5-office") + Str("cups printer name") + Str("office") + conf +
                                        std::string("\x01\x02", 2));
    Seed("section_file", "smb-share", Str("printers") + Str("path") + Str("/var/spool/samba") + smb +
                                          std::string("\x01\x01", 2));
    // Key-value target: key, value, then the file; the buffer size and the
    // operation (set, remove) from the end.
    Seed("keyvalue_file", "set-nptab", Str("10.0.0.7") + Str("colour") + nptab + std::string("\xff\x00", 2));
    Seed("keyvalue_file", "remove-nptab", Str("10.0.0.5") + Str("") + nptab + std::string("\x40\x01", 2));
    Seed("keyvalue_file", "set-usbtab", Str("lp0") + Str("1-1.2") + "lp1=\"1-1.4\"\n" + std::string("\x20\x00", 2));
    Seed("text_lines", "printer-conf", Str("\t%s = %s\n") + Str("product name") + Str("LX 100") + conf);
    Seed("text_lines", "nptab", Str("%s=\"%s\"\n") + Str("10.0.0.5") + Str("office") + nptab);
}

// ---- tool lines: a mix of the outputs above, and long lines -------------------
void RecordToolLines() {
    Seed("tool_lines", "ping-short-buffer", std::string("\x08") + Tool({"/bin/ping", "-w", "1", "127.0.0.1"}));
    Seed("tool_lines", "long-line", std::string("\x40") + "  " + std::string(300, 'x') + "\t\r\n\n  y  \n");
}

}  // namespace

int main(int argc, char **argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: %s CORPUS-DIRECTORY\n", argv[0]);
        return 2;
    }
    g_out = argv[1];
    EnterSandbox();
    ResetSandbox();
    RecordDeviceIds();
    RecordFiles();
    RecordPing();
    RecordBjnp();
    RecordSnmp();
    RecordCups();
    RecordToolLines();
    RecordAvahi();
    return 0;
}
