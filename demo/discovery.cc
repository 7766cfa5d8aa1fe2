// The walk-through's chapters on finding printers that SNMP does not
// know: the IPP printer that only its mDNS announcement makes known, and
// an address where nothing answers at all, which takes the probe down to
// the BJNP backend.
#include <string>

#include "demo/chapters.h"
#include "sandbox/avahi.h"
#include "sandbox/ipp_printer.h"
#include "sandbox/sandbox.h"

namespace xavo::demo {

namespace {

using xavo::test::IppPrinter;

// The value of "key=value" among the double-quoted TXT strings of an
// avahi-browse line; "" when absent.
std::string TxtValue(const std::string &browse, const std::string &key) {
    const std::string head = "\"" + key + "=";
    size_t at = browse.find(head);
    if (at == std::string::npos) return "";
    at += head.size();
    return browse.substr(at, browse.find('"', at) - at);
}

}  // namespace

std::string NetAddCommand(const std::string &ip, const std::string &name, const std::string &probeJson,
                          const std::string &queue) {
    const std::string backend = JsonText(probeJson, "backend");
    const std::string found = JsonText(probeJson, "queue");
    const std::string remote = found.empty() ? queue : found;
    const std::string brand = JsonText(probeJson, "brand");
    const std::string model = JsonText(probeJson, "model");
    const std::string deviceId = JsonText(probeJson, "device_id");
    std::string add = "xavoprinter net add " + ip + " " + name + " --backend " +
                      Quoted(backend.empty() ? "socket" : backend);
    if (!remote.empty()) add += " --queue " + Quoted(remote);
    if (!brand.empty()) add += " --brand " + Quoted(brand);
    if (!model.empty()) add += " --model " + Quoted(model);
    if (!deviceId.empty()) add += " --device-id " + Quoted(deviceId);
    return add;
}

void MdnsChapters(Walk &walk, Stage &stage) {
    const std::string ip = kMdnsIp;
    const std::string browser = xavo::test::AvahiResponder::kBrowsePath;
    walk.Chapter("A printer known only by mDNS");
    walk.Note("An IPP printer on " + ip + " answers no SNMP. It announces itself by multicast DNS, through the");
    walk.Note("sandbox's avahi-daemon; the appliance's browser is the real avahi-browse:");
    walk.Step("ls -l " + browser, 0, "/usr/bin/avahi-browse");
    const std::string service = ";" + ip + ";" + std::to_string(IppPrinter::kPort) + ";";
    const Ran browse = walk.Step(browser + " -rpt _ipp._tcp", 0, service);
    walk.Note("SNMP finds nothing there, so the probe browses: the IPP port gives the backend. The printer names");
    walk.Note("itself only in the \"ty\" key, not in the usb_MFG and usb_MDL keys the library reads, so make and");
    walk.Note("model are recorded as \"Not Found\" (and the library logs why):");
    const Ran probe = walk.Step("xavoprinter net probe " + ip + " --json", 0, "\"identified_by\":\"mdns\"");
    walk.Note("The remote queue is the announcement's \"rp\" key, which the library does not read; it is given");
    walk.Note("to net add with the rest of what the probe found:");
    const std::string rp = TxtValue(browse.output, "rp");
    walk.Step(NetAddCommand(ip, kMdnsQueueName, probe.output, rp), 0,
              "ipp://" + ip + "/" + IppPrinter::kResource);
    walk.Step(std::string("cupsenable ") + kMdnsQueueName);

    walk.Chapter("A file printed on the IPP printer");
    const std::string net = ip + "-" + kMdnsQueueName;
    const std::string memo = "Memo: the IPP printer was found by its mDNS announcement alone.\n";
    xavo::test::PlaceFile("/tmp/memo.txt", memo);
    const Ran printed = walk.Step("xavoprinter print " + net + " /tmp/memo.txt --title memo --json");
    // The handle print gives for the job, where it gives one; else the title.
    const std::string job = JsonText(printed.output, "job");
    walk.Step("xavoprinter job wait " + net + " " + Quoted(job.empty() ? "memo" : job) + " --timeout 30", 0,
              "complete");
    const std::string got = stage.IppPrinterGot(memo.size(), 10000);
    Say("   the printer on " + ip + ":" + std::to_string(IppPrinter::kPort) + " kept a document of " +
        std::to_string(got.size()) + " bytes");
    walk.Check(got == memo, "the document the printer kept is the file");
}

void NobodyChapter(Walk &walk) {
    walk.Chapter("An address where no printer answers");
    walk.Note("When neither SNMP nor mDNS knows the address, the probe asks Debian's BJNP backend. Run without");
    walk.Note("arguments it lists what it finds; on the sandbox's loopback only its generic \"Unknown\" line:");
    walk.Step(std::string("dpkg -S ") + kBjnpBackend, 0, "cups-backend-bjnp");
    walk.Step(kBjnpBackend, 0, "\"Unknown\"");
    walk.Step(std::string("xavoprinter net probe ") + kNobodyIp, 1, "bjnp");
}

}  // namespace xavo::demo
