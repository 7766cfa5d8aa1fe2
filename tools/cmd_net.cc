// net probe, ping, check, remove: printers on the local network.
#include <algorithm>
#include <cstdio>
#include <memory>

#include "checks.h"
#include "commands.h"
#include "cups_query.h"
#include "lists.h"
#include "net_conf.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

struct NetArgs {
    std::string ip;
    std::string name;
};

int Probe(const Registry &reg, const std::string &ip) {
    Report r(reg.bJson, {"ip", "identified_by", "tried", "backend", "queue", "brand", "model", "device_id"});
    r.Set("ip", ip);
    struct Way {
        const char *name;
        int32_t (*probe)(const char *, NetPrinterInfo *);
    };
    static constexpr Way kWays[] = {{"snmp", XAVOPrinterNetInfoGetByIP},
                                    {"mdns", XAVOPrinterNetAvahiInfoGet},
                                    {"bjnp", XAVOPrinterNetBjnpInfoGet}};
    NetPrinterInfo info{};
    Json tried = Json{{"snmp", nullptr}, {"mdns", nullptr}, {"bjnp", nullptr}};
    const Way *found = nullptr;
    for (const Way &way : kWays) {
        Progress(std::string("probing ") + ip + " by " + way.name + "...");
        ResetPlatformError();
        const int32_t res = way.probe(ip.c_str(), &info);
        const uint32_t code = ORLICErrGet();
        tried[way.name] = res == 0   ? "found"
                          : res > 0  ? "nothing found"
                          : code != 0 ? "failed: " + ErrorCodeText(code)
                                      : std::string("failed");
        if (res == 0) {
            found = &way;
            break;
        }
    }
    r.Set("tried", tried);
    if (found == nullptr) {
        return r.FailWithoutCode("no printer identified at " + ip + " by SNMP, mDNS or BJNP");
    }
    r.Set("identified_by", found->name);
    const auto put = [&r](const char *key, const char *value) {
        if (value[0] != '\0') r.Set(key, value);
    };
    put("backend", info.szBackend);
    put("queue", info.szQName);
    put("brand", info.szBrand);
    put("model", info.szModel);
    put("device_id", info.szStringId);
    return r.Succeed();
}

int Ping(const Registry &reg, const std::string &ip) {
    Report r(reg.bJson, {"ip", "status"});
    r.Set("ip", ip);
    char szStatus[16] = {};
    Progress("pinging " + ip + " for one second...");
    ResetPlatformError();
    if (XAVOPrinterNetPingStatus(ip.c_str(), szStatus, sizeof szStatus) != 0) {
        return r.Fail("could not ping " + ip);
    }
    r.Set("status", szStatus);
    return r.Succeed();
}

int Check(const Registry &reg, const NetArgs &a) {
    Report r(reg.bJson, {"ip", "queue_for_address", "cups_name", "name_use"});
    r.Set("ip", a.ip);
    ResetPlatformError();
    const int32_t byIp = XAVOPrinterNetIPCheck(a.ip.c_str());
    if (byIp < 0) return r.Fail("could not ask CUPS for a queue printing to " + a.ip);
    r.Set("queue_for_address", byIp == 0);
    if (!a.name.empty()) {
        const int32_t byName = XAVOPrinterNetCupsNameAndIPCheck(a.ip.c_str(), a.name.c_str());
        if (byName < 0) return r.Fail("could not ask CUPS how the queue name " + a.name + " is used");
        static const char *const kMeaning[] = {"free", "in use for this address", "in use for another device"};
        r.Set("cups_name", a.name);
        r.Set("name_use", kMeaning[std::min(byName, 2)]);
    }
    return r.Succeed();
}

int Remove(const Registry &reg, const NetArgs &a) {
    Report r(reg.bJson, {"printer_id", "cups_queue", "queue_removed", "table_line_removed"});
    NetPrinterConf conf = NetConf(a.ip, a.name);
    const std::string id = conf.szPrinterId;
    r.Set("printer_id", id);
    r.Set("cups_queue", a.name);
    const bool bHadLine = Contains(NetPrinterIds(), id);
    const std::optional<QueueState> state = AskQueueState(a.name, reg.bVerbose);
    if (!state) return r.FailWithoutCode("CUPS could not be asked whether queue " + a.name + " exists (is cupsd running?)");
    const bool bHadQueue = *state != QueueState::kMissing && CupsNameOf(id) == a.name;
    if (!bHadLine && !bHadQueue) {
        return r.FailWithoutCode("no network printer " + id + ": no line for it in the network printer table and no CUPS queue");
    }
    ResetPlatformError();
    if (bHadQueue && XAVOPrinterNetCupsRm(id.c_str()) != 0) return r.Fail("could not remove the CUPS queue " + a.name);
    const bool bQueueGone = AskQueueState(a.name, reg.bVerbose) == QueueState::kMissing;
    r.Set("queue_removed", bHadQueue && bQueueGone);
    if (bHadQueue && !bQueueGone) return r.FailWithoutCode("the CUPS queue " + a.name + " is still there");
    ResetPlatformError();
    if (bHadLine && XAVOPrinterNetUpdateConf(0, &conf) != 0) {
        return r.Fail("could not remove the network printer table line of " + a.ip);
    }
    const bool bLineGone = !Contains(NetPrinterIds(), id);
    r.Set("table_line_removed", bHadLine && bLineGone);
    if (!bLineGone) return r.FailWithoutCode("the network printer table still holds " + id);
    r.Note("the printer's section stays in the printer configuration file");
    return r.Succeed();
}

}  // namespace

void AddNetCommands(CLI::App &app, Registry &reg) {
    CLI::App *net = app.add_subcommand("net", "network printers: identify, register, remove, reach");
    auto a = std::make_shared<NetArgs>();
    reg.Leaf(net, "probe", "identify a network printer by SNMP, then mDNS, then BJNP", Arg::kIp, a->ip,
             "xavoprinter net probe 192.0.2.10", [&reg, a] { return Probe(reg, a->ip); });

    AddNetAddCommand(*net, reg);

    CLI::App *remove = net->add_subcommand("remove", "remove a network printer's CUPS queue and table line");
    AddArg(remove, Arg::kIp, a->ip);
    remove->add_option("NAME", a->name, "its CUPS queue name")->required()->check(CupsQueueName());
    reg.On(
        remove, "xavoprinter net remove 192.0.2.10 office", [&reg, a] { return Remove(reg, *a); },
        [a] { return NetPrinterIdProblem(a->ip, a->name); });

    reg.Leaf(net, "ping", "whether the printer answers (Online or Offline)", Arg::kIp, a->ip,
             "xavoprinter net ping 192.0.2.10", [&reg, a] { return Ping(reg, a->ip); });

    CLI::App *check = net->add_subcommand("check", "whether a queue prints to this address, and how a queue name is used");
    AddArg(check, Arg::kIp, a->ip);
    check->add_option("NAME", a->name, "a CUPS queue name")->check(CupsQueueName());
    reg.On(check, "xavoprinter net check 192.0.2.10 office", [&reg, a] { return Check(reg, *a); });
}

}  // namespace cli
