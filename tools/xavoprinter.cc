// xavoprinter: the appliance's printers from the command line.
//
// Every subcommand calls the library's public operations the way an
// appliance service does and prints what they did.  Exit status: 0 success,
// 1 the operation failed (the message names the platform's last error),
// 2 usage error.  Secrets are read from standard input or a prompt, never
// from the command line, where other users could read them.
#include <termios.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <functional>
#include <iostream>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "cli_args.h"
#include "cli_output.h"
#include "xavoprinter.h"

namespace {

using cli::Args;
using cli::OptionSpec;
using cli::Output;

constexpr char kPrinterConf[] = "/usr/xavo/etc/printer.conf";

struct Command {
    std::string path;      // "usb enable"
    std::string synopsis;  // "DEV BUS"
    std::string summary;
    std::string example;
    size_t minArgs;
    size_t maxArgs;
    std::vector<OptionSpec> options;
    std::function<int(const Args &, Output &)> run;
};

// ---- helpers over the platform's containers ----

struct ListDeleter {
    void operator()(ORLICSzList *p) const { ORLICSzListFree(p); }
};
using List = std::unique_ptr<ORLICSzList, ListDeleter>;

std::vector<std::string> Items(const ORLICSzList *p) {
    std::vector<std::string> out;
    for (int i = 0; p != nullptr && i < p->iCount; ++i) out.emplace_back(ORLICSzListGet(p, i));
    return out;
}

bool IsTerminal() { return isatty(STDERR_FILENO) == 1; }

void Progress(const std::string &text) {
    if (IsTerminal()) std::fprintf(stderr, "%s\n", text.c_str());
}

std::string CupsName(const std::string &printerId) {
    char szName[128] = {};
    if (XAVOPrinterCupsNameGet(printerId.c_str(), szName, sizeof szName) != 0) return "";
    return szName;
}

// ---- printers ----

int CmdList(const Args &, Output &out) {
    ORLICSzList *raw = nullptr;
    int32_t n = XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET, &raw);
    List all(raw);
    if (n < 0) return out.Fail("XAVOPrinterEnumCount");
    List usb(ORLICSzListAlloc(256));
    ORLICSzList *usbRaw = usb.release();
    int32_t usbResult = XAVOPrinterProcUsbtabIdEnum(&usbRaw);
    usb.reset(usbRaw);
    std::vector<std::string> usbIds = usbResult == 0 ? Items(usb.get()) : std::vector<std::string>{};
    std::vector<Output::Row> rows;
    for (const std::string &id : Items(all.get())) {
        bool bUsb = std::find(usbIds.begin(), usbIds.end(), id) != usbIds.end();
        char szQueue[256] = {};
        std::string queue = XAVOPrinterQueueGet(id.c_str(), szQueue, sizeof szQueue) == 0 ? szQueue : "-";
        std::string name = CupsName(id);
        rows.push_back({{"id", id}, {"kind", bUsb ? "usb" : "network"}, {"cups_name", name.empty() ? "-" : name},
                        {"queue", queue}});
    }
    out.Field("count", static_cast<long long>(n));
    out.Rows("printers", rows);
    return out.Finish(0);
}

int CmdShow(const Args &args, Output &out) {
    const std::string &id = args.positional[0];
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    if (hash == nullptr) return out.Fail("ORLICSzHashAlloc");
    int32_t n = ORLICFileGetSection(kPrinterConf, id.c_str(), &hash);
    std::vector<Output::Row> rows;
    if (n > 0) {
        List keys(ORLICSzListAlloc(256));
        ORLICSzList *k = keys.release();
        ORLICSzHashEnumKey(hash, &k);
        keys.reset(k);
        for (const std::string &key : Items(keys.get())) {
            const char *value = ORLICSzHashGetValue(hash, key.c_str());
            rows.push_back({{"key", key}, {"value", value ? value : ""}});
        }
    }
    ORLICSzHashFree(hash);
    out.Field("id", id);
    if (n <= 0) {
        out.Field("ok", false);
        out.Field("error", std::string("no section for this printer in ") + kPrinterConf);
        if (!out.json()) std::fprintf(stderr, "xavoprinter: no printer %s\n", id.c_str());
        return out.Finish(1);
    }
    out.Rows("keys", rows);
    return out.Finish(0);
}

// ---- USB ----

int CmdUsbEnable(const Args &args, Output &out) {
    if (XAVOPrinterEnableExt(1, args.positional[0].c_str(), args.positional[1].c_str()) != 0) {
        return out.Fail("XAVOPrinterEnableExt");
    }
    out.Field("device", args.positional[0]);
    out.Field("bus", args.positional[1]);
    out.Field("enabled", true);
    return out.Finish(0);
}

int CmdUsbDisable(const Args &args, Output &out) {
    std::optional<std::string> dev = args.positional.empty() ? std::nullopt : std::optional(args.positional[0]);
    std::optional<std::string> bus = args.Get("--bus");
    if (args.positional.size() > 1) bus = args.positional[1];
    if (XAVOPrinterEnableExt(0, dev ? dev->c_str() : nullptr, bus ? bus->c_str() : nullptr) != 0) {
        return out.Fail("XAVOPrinterEnableExt");
    }
    if (dev) out.Field("device", *dev);
    if (bus) out.Field("bus", *bus);
    out.Field("enabled", false);
    return out.Finish(0);
}

int CmdUsbDevid(const Args &args, Output &out) {
    std::vector<char> buf(4096, '\0');
    int32_t r = XAVOPrinterGetStringId(args.positional[0].c_str(), buf.data(), static_cast<int32_t>(buf.size()));
    if (r < 0) return out.Fail("XAVOPrinterGetStringId");
    out.Field("device", args.positional[0]);
    out.Field("device_id", std::string(buf.data()));
    if (r > 0) out.Field("stated_length", static_cast<long long>(r));
    char szBrand[128] = {}, szModel[128] = {};
    if (XAVOPrinterConfStringIdGetVendor(buf.data(), szBrand, sizeof szBrand) == 0) out.Field("brand", szBrand);
    if (XAVOPrinterConfStringIdGetModel(buf.data(), szModel, sizeof szModel) == 0) out.Field("model", szModel);
    return out.Finish(0);
}

int CmdUsbReset(const Args &args, Output &out) {
    if (XAVOResetPrinter(args.positional[0].c_str()) != 0) return out.Fail("XAVOResetPrinter");
    out.Field("device", args.positional[0]);
    out.Field("reset", true);
    return out.Finish(0);
}

// ---- network ----

void InfoFields(Output &out, const std::string &prefix, const NetPrinterInfo &info) {
    out.Field(prefix + "backend", std::string(info.szBackend));
    out.Field(prefix + "queue", std::string(info.szQName));
    out.Field(prefix + "brand", std::string(info.szBrand));
    out.Field(prefix + "model", std::string(info.szModel));
    out.Field(prefix + "device_id", std::string(info.szStringId));
}

int CmdNetProbe(const Args &args, Output &out) {
    const std::string &ip = args.positional[0];
    NetPrinterInfo info{};
    struct Way {
        const char *name;
        int32_t (*probe)(const char *, NetPrinterInfo *);
    };
    const Way ways[] = {{"snmp", XAVOPrinterNetInfoGetByIP},
                        {"mdns", XAVOPrinterNetAvahiInfoGet},
                        {"bjnp", XAVOPrinterNetBjnpInfoGet}};
    out.Field("ip", ip);
    std::string found = "none";
    for (const Way &way : ways) {
        Progress(std::string("probing ") + ip + " by " + way.name + "...");
        int32_t r = way.probe(ip.c_str(), &info);
        out.Field(std::string(way.name) + "_result", static_cast<long long>(r));
        if (r < 0) out.Note(std::string(way.name) + ": failed, " + cli::ErrorCodeText(ORLICErrGet()));
        if (r == 0) {
            found = way.name;
            break;
        }
    }
    out.Field("identified_by", found);
    InfoFields(out, "", info);
    return out.Finish(found == "none" ? 1 : 0);
}

NetPrinterConf NetConfFrom(const Args &args) {
    NetPrinterConf conf{};
    auto put = [&](char *field, size_t cb, const char *option) {
        if (auto v = args.Get(option)) std::snprintf(field, cb, "%s", v->c_str());
    };
    std::snprintf(conf.szIP, sizeof conf.szIP, "%s", args.positional[0].c_str());
    std::snprintf(conf.szCupsPrinterName, sizeof conf.szCupsPrinterName, "%s", args.positional[1].c_str());
    put(conf.szBackend, sizeof conf.szBackend, "--backend");
    put(conf.szQName, sizeof conf.szQName, "--queue");
    put(conf.szBrand, sizeof conf.szBrand, "--brand");
    put(conf.szModel, sizeof conf.szModel, "--model");
    put(conf.szStringId, sizeof conf.szStringId, "--device-id");
    put(conf.szDriver, sizeof conf.szDriver, "--driver");
    // The appliance names a network printer's section by address and queue
    // name, as the network printer table lists it.
    const std::string id = std::string(conf.szIP) + "-" + conf.szCupsPrinterName;
    if (id.size() >= sizeof conf.szPrinterId || args.positional[0].size() >= sizeof conf.szIP) {
        throw std::invalid_argument("address or queue name too long for a printer ID");
    }
    std::memcpy(conf.szPrinterId, id.c_str(), id.size() + 1);
    return conf;
}

int CmdNetAdd(const Args &args, Output &out) {
    NetPrinterConf conf = NetConfFrom(args);
    if (conf.szBackend[0] == '\0') std::snprintf(conf.szBackend, sizeof conf.szBackend, "socket");
    out.Field("printer_id", std::string(conf.szPrinterId));
    Progress("writing the printer's section...");
    if (XAVOPrinterNetConfSetup(&conf, 0) != 0) return out.Fail("XAVOPrinterNetConfSetup");
    Progress("adding the network printer table line and the printers share...");
    if (XAVOPrinterNetUpdateConf(1, &conf) != 0) return out.Fail("XAVOPrinterNetUpdateConf");
    Progress("creating the CUPS queue...");
    std::string ppd = args.Get("--ppd").value_or("");
    if (XAVOPrinterNetCupsAdd(&conf, ppd.empty() ? nullptr : ppd.c_str()) != 0) {
        return out.Fail("XAVOPrinterNetCupsAdd");
    }
    out.Field("device_uri", std::string(conf.szBackend) + "://" + conf.szIP + "/" + conf.szQName);
    out.Field("cups_name", std::string(conf.szCupsPrinterName));
    return out.Finish(0);
}

int CmdNetRemove(const Args &args, Output &out) {
    NetPrinterConf conf = NetConfFrom(args);
    out.Field("printer_id", std::string(conf.szPrinterId));
    if (XAVOPrinterNetCupsRm(conf.szPrinterId) != 0) return out.Fail("XAVOPrinterNetCupsRm");
    if (XAVOPrinterNetUpdateConf(0, &conf) != 0) return out.Fail("XAVOPrinterNetUpdateConf");
    out.Field("removed", true);
    return out.Finish(0);
}

int CmdNetPing(const Args &args, Output &out) {
    char szStatus[16] = {};
    Progress("pinging " + args.positional[0] + " for one second...");
    if (XAVOPrinterNetPingStatus(args.positional[0].c_str(), szStatus, sizeof szStatus) != 0) {
        return out.Fail("XAVOPrinterNetPingStatus");
    }
    out.Field("ip", args.positional[0]);
    out.Field("status", std::string(szStatus));
    return out.Finish(0);
}

int CmdNetCheck(const Args &args, Output &out) {
    const std::string &ip = args.positional[0];
    out.Field("ip", ip);
    if (args.positional.size() == 1) {
        int32_t r = XAVOPrinterNetIPCheck(ip.c_str());
        if (r < 0) return out.Fail("XAVOPrinterNetIPCheck");
        out.Field("queue_for_address", r == 0);
        return out.Finish(0);
    }
    int32_t r = XAVOPrinterNetCupsNameAndIPCheck(ip.c_str(), args.positional[1].c_str());
    if (r < 0) return out.Fail("XAVOPrinterNetCupsNameAndIPCheck");
    static const char *const kMeaning[] = {"free", "in use for this address", "in use for another device"};
    out.Field("cups_name", args.positional[1]);
    out.Field("name", std::string(kMeaning[r > 2 ? 2 : r]));
    return out.Finish(0);
}

// ---- queues ----

int CmdQueueAdd(const Args &args, Output &out) {
    std::string ppd = args.Get("--ppd").value_or("");
    if (XAVOPrinterCupsAdd(args.positional[0].c_str(), ppd.empty() ? nullptr : ppd.c_str()) != 0) {
        return out.Fail("XAVOPrinterCupsAdd");
    }
    out.Field("printer_id", args.positional[0]);
    out.Field("cups_name", CupsName(args.positional[0]));
    out.Field("enabled", false);
    return out.Finish(0);
}

int CmdQueueEnable(const Args &args, Output &out, bool bEnable) {
    if (XAVOPrinterCupsPrinterEnable(args.positional[0].c_str(), bEnable ? 1 : 0) != 0) {
        return out.Fail("XAVOPrinterCupsPrinterEnable");
    }
    out.Field("cups_name", args.positional[0]);
    out.Field("enabled", bEnable);
    return out.Finish(0);
}

int CmdQueueRemove(const Args &args, Output &out) {
    const bool bNet = args.Has("--network");
    int32_t r = bNet ? XAVOPrinterNetCupsRm(args.positional[0].c_str()) : XAVOPrinterCupsRm(args.positional[0].c_str());
    if (r != 0) return out.Fail(bNet ? "XAVOPrinterNetCupsRm" : "XAVOPrinterCupsRm");
    out.Field("printer_id", args.positional[0]);
    out.Field("removed", true);
    return out.Finish(0);
}

int CmdQueuePpd(const Args &args, Output &out) {
    char *text = XAVOCupsGetPPD(args.positional[0].c_str());
    if (text == nullptr) return out.Fail("XAVOCupsGetPPD");
    std::string ppd(text);
    std::free(text);
    if (out.json()) {
        out.Field("printer_id", args.positional[0]);
        out.Field("ppd", ppd);
        return out.Finish(0);
    }
    std::fputs(ppd.c_str(), stdout);
    return 0;
}

int CmdQueuePurgeUsb(const Args &, Output &out) {
    if (XAVOPrinterCupsUsbConfRmAll() != 0) return out.Fail("XAVOPrinterCupsUsbConfRmAll");
    out.Field("purged", true);
    return out.Finish(0);
}

int CmdQueueCheck(const Args &args, Output &out) {
    int32_t r = XAVOPrinterCupsNameCheck(args.positional[0].c_str(), args.positional[1].c_str());
    if (r < 0) return out.Fail("XAVOPrinterCupsNameCheck");
    static const char *const kMeaning[] = {"free", "in use for this printer", "in use for another device"};
    out.Field("cups_name", args.positional[1]);
    out.Field("name", std::string(kMeaning[r > 2 ? 2 : r]));
    return out.Finish(0);
}

// ---- printing and jobs ----

int CmdPrint(const Args &args, Output &out) {
    std::string title = args.Get("--title").value_or("");
    if (XAVOPrinterCupsPrintFile(args.positional[0].c_str(), args.positional[1].c_str(),
                                 title.empty() ? nullptr : title.c_str(), args.Has("--remove") ? 1 : 0) != 0) {
        return out.Fail("XAVOPrinterCupsPrintFile");
    }
    out.Field("printer_id", args.positional[0]);
    out.Field("file", args.positional[1]);
    out.Field("submitted", true);
    return out.Finish(0);
}

int CmdPrintTestPage(const Args &args, Output &out) {
    if (XAVOPrinterCupsPrintTestPage(args.positional[0].c_str()) != 0) return out.Fail("XAVOPrinterCupsPrintTestPage");
    out.Field("printer_id", args.positional[0]);
    out.Field("submitted", true);
    return out.Finish(0);
}

int CmdJobWait(const Args &args, Output &out) {
    long timeout = std::stol(args.Get("--timeout").value_or("60"));
    auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(timeout);
    out.Field("printer_id", args.positional[0]);
    out.Field("job", args.positional[1]);
    for (int round = 0;; ++round) {
        int32_t r = XAVOPrinterCupsJobWaitComplete(args.positional[0].c_str(), args.positional[1].c_str());
        if (r < 0) return out.Fail("XAVOPrinterCupsJobWaitComplete");
        if (r == 0) {
            out.Field("complete", true);
            return out.Finish(0);
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            out.Field("complete", false);
            if (!out.json()) std::fprintf(stderr, "xavoprinter: job still queued after %lds\n", timeout);
            return out.Finish(1);
        }
        Progress("job " + args.positional[1] + " still queued (" + std::to_string(round + 1) + "s)...");
        std::this_thread::sleep_for(std::chrono::seconds(1));
    }
}

int CmdSpoolClean(const Args &, Output &out) {
    if (XAVOPrinterCleanSpool() != 0) return out.Fail("XAVOPrinterCleanSpool");
    out.Field("cleaned", true);
    return out.Finish(0);
}

// ---- sharing ----

int CmdShareStatus(const Args &, Output &out) {
    out.Field("printers_share_active", XAVOPrinterIsActive() == 1);
    return out.Finish(0);
}

int CmdCloudGet(const Args &args, Output &out) {
    PrinterGoogleInfo info{};
    int32_t r = XAVOPrinterGoogleInfoGet(&info);
    if (r != 0) return out.Fail("XAVOPrinterGoogleInfoGet");
    const bool bPassword = info.szPassword[0] != '\0';
    out.Field("account", std::string(info.szAccount));
    out.Field("secret_in_force", std::string(bPassword ? "password" : "refresh token"));
    if (args.Has("--reveal")) out.Field("secret", std::string(bPassword ? info.szPassword : info.szRefreshToken));
    explicit_bzero(&info, sizeof info);
    return out.Finish(0);
}

// Reads one line from standard input; on a terminal, prompts without echo.
std::string ReadSecret(const std::string &prompt) {
    std::string secret;
    if (isatty(STDIN_FILENO) == 1) {
        std::fprintf(stderr, "%s: ", prompt.c_str());
        termios old{};
        tcgetattr(STDIN_FILENO, &old);
        termios quiet = old;
        quiet.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        tcsetattr(STDIN_FILENO, TCSANOW, &quiet);
        std::getline(std::cin, secret);
        tcsetattr(STDIN_FILENO, TCSANOW, &old);
        std::fprintf(stderr, "\n");
    } else {
        std::getline(std::cin, secret);
    }
    return secret;
}

int CmdCloudSet(const Args &args, Output &out) {
    PrinterGoogleInfo info{};
    std::snprintf(info.szAccount, sizeof info.szAccount, "%s", args.positional[0].c_str());
    const bool bToken = args.Has("--token");
    std::string secret = ReadSecret(bToken ? "refresh token" : "password");
    if (bToken) {
        std::snprintf(info.szRefreshToken, sizeof info.szRefreshToken, "%s", secret.c_str());
    } else {
        std::snprintf(info.szPassword, sizeof info.szPassword, "%s", secret.c_str());
    }
    std::fill(secret.begin(), secret.end(), '\0');
    int32_t r = XAVOPrinterGoogleInfoSet(&info);
    explicit_bzero(&info, sizeof info);
    if (r != 0) return out.Fail("XAVOPrinterGoogleInfoSet");
    out.Field("account", args.positional[0]);
    out.Field("stored", std::string(bToken ? "refresh token" : "password"));
    return out.Finish(0);
}

int CmdUsbipEject(const Args &args, Output &out) {
    if (XAVOPrinterUsbipEject(args.positional[0].c_str()) != 0) return out.Fail("XAVOPrinterUsbipEject");
    out.Field("printer_id", args.positional[0]);
    out.Field("ejected", true);
    return out.Finish(0);
}

int CmdUsbipLockStatus(const Args &args, Output &out) {
    char szStatus[256] = {};
    if (XAVOPrinterUsbipGetLockStatus(args.positional[0].c_str(), szStatus, sizeof szStatus) != 0) {
        return out.Fail("XAVOPrinterUsbipGetLockStatus");
    }
    out.Field("printer_id", args.positional[0]);
    out.Field("lock", std::string(szStatus));
    return out.Finish(0);
}

int CmdUsbipRelease(const Args &args, Output &out) {
    if (XAVOPrinterUsbipLockRelease(args.positional[0].c_str()) != 0) return out.Fail("XAVOPrinterUsbipLockRelease");
    out.Field("printer_id", args.positional[0]);
    out.Field("released", true);
    return out.Finish(0);
}

const std::vector<OptionSpec> kNetOptions = {
    {"--backend", true, "CUPS backend: socket (default), lpd, ipp or bjnp"},
    {"--queue", true, "queue name on the printer"},
    {"--brand", true, "manufacturer"},
    {"--model", true, "model"},
    {"--device-id", true, "IEEE 1284 device ID string"},
    {"--driver", true, "driver"},
    {"--ppd", true, "PPD file to install with the queue"},
};

std::vector<Command> Commands() {
    return {
        {"list", "", "every printer with its CUPS printer name, kind and queue state", "xavoprinter list --json", 0,
         0, {}, CmdList},
        {"show", "ID", "the printer's section of the printer configuration file", "xavoprinter show 04b8:0005:SN0001",
         1, 1, {}, CmdShow},
        {"usb enable", "DEV BUS", "register a plugged-in USB printer (as the hotplug handler does)",
         "xavoprinter usb enable lp0 1-1.2", 2, 2, {}, CmdUsbEnable},
        {"usb disable", "[DEV] [BUS]", "forget an unplugged USB printer, by device name and/or bus ID",
         "xavoprinter usb disable lp0   |   xavoprinter usb disable --bus 1-1", 0, 2,
         {{"--bus", true, "USB bus ID (prefix) of the printers to forget"}}, CmdUsbDisable},
        {"usb devid", "DEV", "ask a usblp device for its device ID string", "xavoprinter usb devid lp0", 1, 1, {},
         CmdUsbDevid},
        {"usb reset", "DEV", "soft-reset a usblp device", "xavoprinter usb reset lp0", 1, 1, {}, CmdUsbReset},
        {"net probe", "IP", "identify a network printer by SNMP, then mDNS, then BJNP",
         "xavoprinter net probe 192.0.2.10", 1, 1, {}, CmdNetProbe},
        {"net add", "IP NAME", "register a network printer: its section, table line and CUPS queue",
         "xavoprinter net add 192.0.2.10 office --backend socket --brand ACME --model 'Laser 5'", 2, 2, kNetOptions,
         CmdNetAdd},
        {"net remove", "IP NAME", "remove a network printer's queue and table line", "xavoprinter net remove 192.0.2.10 office",
         2, 2, {}, CmdNetRemove},
        {"net ping", "IP", "whether the printer answers (Online/Offline)", "xavoprinter net ping 192.0.2.10", 1, 1, {},
         CmdNetPing},
        {"net check", "IP [NAME]", "whether a queue serves this address, or how a queue name is used",
         "xavoprinter net check 192.0.2.10 office", 1, 2, {}, CmdNetCheck},
        {"queue add", "ID", "create a USB printer's CUPS queue (left disabled)",
         "xavoprinter queue add 04b8:0005:SN0001 --ppd /tmp/printer.ppd", 1, 1,
         {{"--ppd", true, "PPD file to install and keep"}}, CmdQueueAdd},
        {"queue enable", "NAME", "enable a CUPS queue", "xavoprinter queue enable usbprinter1", 1, 1, {},
         [](const Args &a, Output &o) { return CmdQueueEnable(a, o, true); }},
        {"queue disable", "NAME", "disable a CUPS queue", "xavoprinter queue disable usbprinter1", 1, 1, {},
         [](const Args &a, Output &o) { return CmdQueueEnable(a, o, false); }},
        {"queue remove", "ID", "remove a printer's CUPS queue", "xavoprinter queue remove 04b8:0005:SN0001", 1, 1,
         {{"--network", false, "the printer is a network printer"}}, CmdQueueRemove},
        {"queue ppd", "ID", "print the PPD file kept for a printer", "xavoprinter queue ppd 04b8:0005:SN0001", 1, 1, {},
         CmdQueuePpd},
        {"queue purge-usb", "", "remove the USB queues from CUPS's printers.conf (scheduler stopped)",
         "xavoprinter queue purge-usb", 0, 0, {}, CmdQueuePurgeUsb},
        {"queue check", "ID NAME", "how a CUPS printer name is used", "xavoprinter queue check 04b8:0005:SN0001 usbprinter1",
         2, 2, {}, CmdQueueCheck},
        {"print", "ID FILE", "print a file on a printer", "xavoprinter print 04b8:0005:SN0001 report.pdf --title Report",
         2, 2, {{"--title", true, "job title"}, {"--remove", false, "remove FILE once submitted"}}, CmdPrint},
        {"print test-page", "ID", "print the test page", "xavoprinter print test-page 04b8:0005:SN0001", 1, 1, {},
         CmdPrintTestPage},
        {"job wait", "ID JOB", "wait until JOB (title, file or number) has left the printer's lpq listing",
         "xavoprinter job wait 04b8:0005:SN0001 Report --timeout 30", 2, 2,
         {{"--timeout", true, "seconds to wait (default 60)"}}, CmdJobWait},
        {"spool clean", "", "cancel every job and empty the spool directory", "xavoprinter spool clean", 0, 0, {},
         CmdSpoolClean},
        {"share status", "", "whether the Samba printers share is set up", "xavoprinter share status", 0, 0, {},
         CmdShareStatus},
        {"cloud get", "", "the cloud print account and which secret is in force", "xavoprinter cloud get", 0, 0,
         {{"--reveal", false, "also print the secret"}}, CmdCloudGet},
        {"cloud set", "ACCOUNT", "store the cloud print account; the secret is read from standard input",
         "printf '%s\\n' \"$TOKEN\" | xavoprinter cloud set user@example.com --token", 1, 1,
         {{"--token", false, "the secret is a refresh token (default: a password)"}}, CmdCloudSet},
        {"usbip eject", "ID", "eject a printer from USB/IP sharing", "xavoprinter usbip eject 04b8:0005:SN0001", 1, 1, {},
         CmdUsbipEject},
        {"usbip lock-status", "ID", "a printer's USB/IP lock status", "xavoprinter usbip lock-status 04b8:0005:SN0001",
         1, 1, {}, CmdUsbipLockStatus},
        {"usbip release", "ID", "release a printer's USB/IP lock", "xavoprinter usbip release 04b8:0005:SN0001", 1, 1,
         {}, CmdUsbipRelease},
    };
}

void CommandHelp(const Command &c) {
    std::printf("usage: xavoprinter %s%s%s [--json]\n\n%s\n", c.path.c_str(), c.synopsis.empty() ? "" : " ",
                c.synopsis.c_str(), c.summary.c_str());
    if (!c.options.empty()) {
        std::printf("\noptions:\n");
        for (const OptionSpec &o : c.options) {
            std::printf("  %-12s %s%s\n", o.name.c_str(), o.bTakesValue ? "VALUE  " : "", o.help.c_str());
        }
    }
    std::printf("  --json       print one JSON object\n\nexample:\n  %s\n", c.example.c_str());
}

void MainHelp(const std::vector<Command> &commands) {
    std::printf(
        "usage: xavoprinter COMMAND [ARGS] [--json]\n\n"
        "The appliance's printers: USB and network printers, their CUPS queues, jobs and sharing.\n"
        "Exit status: 0 success, 1 the operation failed, 2 usage error.\n\ncommands:\n");
    for (const Command &c : commands) {
        std::string head = c.path + (c.synopsis.empty() ? "" : " " + c.synopsis);
        std::printf("  %-28s %s\n", head.c_str(), c.summary.c_str());
    }
    std::printf("\n'xavoprinter COMMAND --help' shows a command's options and an example.\n");
}

int Usage(const std::string &error, const Command *c) {
    std::fprintf(stderr, "xavoprinter: %s\n", error.c_str());
    if (c != nullptr) {
        std::fprintf(stderr, "usage: xavoprinter %s %s  (see 'xavoprinter %s --help')\n", c->path.c_str(),
                     c->synopsis.c_str(), c->path.c_str());
    } else {
        std::fprintf(stderr, "see 'xavoprinter --help'\n");
    }
    return 2;
}

// Options that would put a secret on the command line, where any user can
// read it in the process list: refused outright.
bool NamesASecret(const std::string &word) {
    for (const char *bad : {"--password", "--pass", "--secret", "--refresh-token"}) {
        if (word == bad || word.rfind(std::string(bad) + "=", 0) == 0) return true;
    }
    return false;
}

}  // namespace

int main(int argc, char **argv) {
    std::vector<std::string> words(argv + 1, argv + argc);
    const std::vector<Command> commands = Commands();
    if (words.empty() || words[0] == "--help" || words[0] == "-h" || words[0] == "help") {
        MainHelp(commands);
        return words.empty() ? 2 : 0;
    }
    // The longest subcommand path that the words begin with.
    const Command *found = nullptr;
    size_t used = 0;
    for (const Command &c : commands) {
        std::vector<std::string> path;
        for (size_t at = 0; at <= c.path.size();) {
            size_t sp = c.path.find(' ', at);
            if (sp == std::string::npos) sp = c.path.size();
            path.push_back(c.path.substr(at, sp - at));
            at = sp + 1;
        }
        if (path.size() > words.size() || path.size() <= used) continue;
        if (std::equal(path.begin(), path.end(), words.begin())) {
            found = &c;
            used = path.size();
        }
    }
    if (found == nullptr) return Usage("unknown command '" + words[0] + "'", nullptr);
    std::vector<std::string> rest(words.begin() + static_cast<long>(used), words.end());
    for (const std::string &w : rest) {
        if (NamesASecret(w)) {
            return Usage("secrets are never taken from the command line; give them on standard input", found);
        }
    }
    Args args;
    if (auto error = cli::ParseArgs(rest, found->options, args)) return Usage(*error, found);
    if (args.help) {
        CommandHelp(*found);
        return 0;
    }
    if (args.positional.size() < found->minArgs || args.positional.size() > found->maxArgs) {
        return Usage("wrong number of arguments", found);
    }
    Output out(args.json);
    try {
        return found->run(args, out);
    } catch (const std::exception &e) {
        return Usage(std::string("bad argument: ") + e.what(), found);
    }
}
