// net add: a network printer registered all or nothing.  The library does
// it in three calls (section, table line and share, queue) and undoes
// none of them; the command checks first, and takes back what it made
// when a later call fails.  Only the section cannot be taken back: the
// library never removes one.
#include <memory>
#include <vector>

#include "checks.h"
#include "commands.h"
#include "lists.h"
#include "net_conf.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

struct AddArgs {
    std::string ip, name, backend = "socket", queue, brand, model, deviceId, driver, ppd;
    bool bReplace = false;
};

// Who else uses the address or the name, in the table and in CUPS.
struct Conflicts {
    std::vector<std::string> printers;  // other network printer IDs
    bool bForeignQueueAtAddress = false;
    bool bQueueNameElsewhere = false;
    bool bOwnQueue = false;  // a queue of this name prints to this address
    bool bOwnLine = false;   // the table already maps the address to the name
};

Conflicts FindConflicts(const std::string &ip, const std::string &name, const std::string &id) {
    Conflicts c;
    bool bOtherAtIp = false;
    for (const std::string &other : NetPrinterIds()) {
        if (other == id) {
            c.bOwnLine = true;
            continue;
        }
        // A network printer ID is address, "-", queue name; an IPv4
        // address holds no "-".
        const size_t dash = other.find('-');
        if (dash == std::string::npos) continue;
        const bool bSameIp = other.substr(0, dash) == ip;
        if (bSameIp || other.substr(dash + 1) == name) c.printers.push_back(other);
        bOtherAtIp = bOtherAtIp || bSameIp;
    }
    const int32_t byName = XAVOPrinterNetCupsNameAndIPCheck(ip.c_str(), name.c_str());
    c.bOwnQueue = byName == 1;
    c.bQueueNameElsewhere = byName == 2;
    c.bForeignQueueAtAddress = !c.bOwnQueue && !bOtherAtIp && XAVOPrinterNetIPCheck(ip.c_str()) == 0;
    return c;
}

bool SectionExists(const std::string &id) {
    OwnedHash hash(ORLICSzHashAlloc(64));
    return ReadSection(id, hash) > 0;
}

// Takes another printer away as "net remove" would; its section stays.
bool TakeAway(const std::string &otherId) {
    const size_t dash = otherId.find('-');
    NetPrinterConf other = NetConf(otherId.substr(0, dash), otherId.substr(dash + 1));
    if (!CupsNameOf(otherId).empty() && XAVOPrinterNetIPCheck(other.szIP) == 0) {
        if (XAVOPrinterNetCupsRm(otherId.c_str()) != 0) return false;
    }
    return XAVOPrinterNetUpdateConf(0, &other) == 0;
}

NetPrinterConf ConfFrom(const AddArgs &a) {
    NetPrinterConf conf = NetConf(a.ip, a.name);
    PutField(conf.szBackend, a.backend);
    PutField(conf.szQName, a.queue);
    PutField(conf.szBrand, a.brand);
    PutField(conf.szModel, a.model);
    PutField(conf.szStringId, a.deviceId);
    PutField(conf.szDriver, a.driver);
    return conf;
}

// Who uses the address or the name, in words; "" when nobody else.
std::string InUse(const Conflicts &c, const AddArgs &a) {
    std::vector<std::string> users = c.printers;
    if (c.bForeignQueueAtAddress) users.push_back("a CUPS queue printing to " + a.ip);
    if (c.bQueueNameElsewhere) users.push_back("the CUPS queue " + a.name + " of another device");
    std::string text;
    for (const std::string &u : users) text += (text.empty() ? "" : ", ") + u;
    return text;
}

// Takes back what this run made after a failed step: the queue (when it
// was tried and did not exist before) and the table line (when it did not
// exist before).  Fills "undone" and "remains".
void TakeBack(Report &r, const AddArgs &a, const NetPrinterConf &conf, const Conflicts &c, bool bHadSection,
              bool bQueueTried) {
    Json undone = Json::array();
    Json remains = Json::array();
    const auto take = [&](bool bDone, const std::string &what) { (bDone ? undone : remains).push_back(what); };
    if (bQueueTried && !c.bOwnQueue && XAVOPrinterNetCupsNameAndIPCheck(a.ip.c_str(), a.name.c_str()) == 1) {
        take(XAVOPrinterNetCupsRm(conf.szPrinterId) == 0, "CUPS queue " + a.name);
    }
    if (!c.bOwnLine) take(XAVOPrinterNetUpdateConf(0, &conf) == 0, "network printer table line " + a.ip);
    if (!bHadSection) {
        remains.push_back("section [" + std::string(conf.szPrinterId) + "] of " + kPrinterConf +
                          " (the library never removes one)");
    }
    r.Set("undone", undone);
    r.Set("remains", remains);
}

// The library's three steps, taken back as far as possible when one fails.
int Register(Report &r, const AddArgs &a, const NetPrinterConf &conf, const Conflicts &c) {
    const bool bHadSection = SectionExists(conf.szPrinterId);
    Progress("writing the printer's section...");
    ResetPlatformError();
    if (XAVOPrinterNetConfSetup(&conf, 0) != 0) return r.Fail("could not write the printer's section");
    Progress("adding the network printer table line and the printers share...");
    ResetPlatformError();
    if (XAVOPrinterNetUpdateConf(1, &conf) != 0) {
        const uint32_t uCode = ORLICErrGet();
        TakeBack(r, a, conf, c, bHadSection, false);
        return r.Fail("could not add the network printer table line or the printers share", uCode);
    }
    Progress("creating the CUPS queue...");
    ResetPlatformError();
    const int32_t made = XAVOPrinterNetCupsAdd(&conf, a.ppd.empty() ? nullptr : a.ppd.c_str());
    const uint32_t uCode = ORLICErrGet();
    if (made != 0 || XAVOPrinterNetCupsNameAndIPCheck(a.ip.c_str(), a.name.c_str()) != 1) {
        TakeBack(r, a, conf, c, bHadSection, true);
        return r.Fail(made != 0 ? "could not create the CUPS queue " + a.name
                                : "CUPS has no queue " + a.name + " for " + a.ip + " afterwards",
                      uCode);
    }
    r.Set("undone", Json::array());
    r.Set("remains", Json::array());
    r.Set("device_uri", std::string(conf.szBackend) + "://" + conf.szIP + "/" + conf.szQName);
    return r.Succeed();
}

int Add(const Registry &reg, const AddArgs &a) {
    Report r(reg.bJson, {"printer_id", "cups_queue", "device_uri", "replaced", "undone", "remains"});
    const NetPrinterConf conf = ConfFrom(a);
    r.Set("printer_id", conf.szPrinterId);
    r.Set("cups_queue", a.name);
    const Conflicts c = FindConflicts(a.ip, a.name, conf.szPrinterId);
    if (const std::string users = InUse(c, a); !users.empty() && !a.bReplace) {
        return r.FailWithoutCode("the address or the queue name is already in use (" + users +
                                 "); nothing was changed; --replace takes them away first");
    }
    Json replaced = Json::array();
    for (const std::string &other : c.printers) {
        ResetPlatformError();
        if (!TakeAway(other)) return r.Fail("could not take away the printer " + other);
        replaced.push_back(other);
    }
    r.Set("replaced", replaced);
    if (c.bForeignQueueAtAddress) r.Note("another CUPS queue, not the appliance's, also prints to " + a.ip);
    return Register(r, a, conf, c);
}

}  // namespace

void AddNetAddCommand(CLI::App &net, Registry &reg) {
    auto a = std::make_shared<AddArgs>();
    CLI::App *add = net.add_subcommand(
        "add", "register a network printer: its section, table line and CUPS queue, all or nothing");
    AddArg(add, Arg::kIp, a->ip);
    add->add_option("NAME", a->name, "the CUPS queue name to create")->required()->check(CupsQueueName());
    add->add_option("--backend", a->backend, "CUPS backend (default socket)")
        ->check(CLI::IsMember({"socket", "lpd", "ipp", "bjnp"}));
    add->add_option("--queue", a->queue, "queue name on the printer")->check(Text(kMaxField));
    add->add_option("--brand", a->brand, "manufacturer")->check(Text(kMaxField));
    add->add_option("--model", a->model, "model")->check(Text(kMaxField));
    add->add_option("--device-id", a->deviceId, "IEEE 1284 device ID string")->check(Text(kMaxDeviceId));
    add->add_option("--driver", a->driver, "driver")->check(Text(kMaxField));
    add->add_option("--ppd", a->ppd, "PPD file to install with the queue")->check(CLI::ExistingFile);
    add->add_flag("--replace", a->bReplace,
                  "take away the printers already using the address or the name (their sections stay)");
    reg.On(
        add, "xavoprinter net add 192.0.2.10 office --backend socket --brand ACME --model 'Laser 5'",
        [&reg, a] { return Add(reg, *a); }, [a] { return NetPrinterIdProblem(a->ip, a->name); });
}

}  // namespace cli
