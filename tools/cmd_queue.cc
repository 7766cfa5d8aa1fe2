// queue add, enable, disable, remove, ppd, check, purge-usb: the printers'
// CUPS queues.  After every change CUPS is asked what it now holds.
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <sstream>

#include "checks.h"
#include "commands.h"
#include "cups_query.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

struct QueueArgs {
    std::string id;
    std::string name;
    std::string ppd;
    bool bNetwork = false;
};

// The state CUPS reports for a queue, null when CUPS cannot be asked.
Json StateOf(const Registry &reg, const std::string &name) {
    const std::optional<QueueState> state = AskQueueState(name, reg.bVerbose);
    return state ? Json(QueueStateName(*state)) : Json(nullptr);
}

int Add(const Registry &reg, const QueueArgs &a) {
    Report r(reg.bJson, {"printer_id", "cups_queue", "queue_state"});
    r.Set("printer_id", a.id);
    ResetPlatformError();
    if (XAVOPrinterCupsAdd(a.id.c_str(), a.ppd.empty() ? nullptr : a.ppd.c_str()) != 0) {
        return r.Fail("could not create a CUPS queue for " + a.id);
    }
    const std::string name = CupsNameOf(a.id);
    r.Set("cups_queue", name.empty() ? Json(nullptr) : Json(name));
    const Json state = StateOf(reg, name);
    r.Set("queue_state", state);
    if (name.empty() || state == "missing") return r.FailWithoutCode("CUPS has no queue for " + a.id + " afterwards");
    return r.Succeed();
}

int Enable(const Registry &reg, const std::string &name, bool bEnable) {
    Report r(reg.bJson, {"cups_queue", "queue_state"});
    r.Set("cups_queue", name);
    const char *wanted = bEnable ? "enabled" : "disabled";
    if (StateOf(reg, name) == "missing") return r.FailWithoutCode("no CUPS queue " + name);
    ResetPlatformError();
    if (XAVOPrinterCupsPrinterEnable(name.c_str(), bEnable ? 1 : 0) != 0) {
        return r.Fail(std::string("could not ") + (bEnable ? "enable" : "disable") + " the CUPS queue " + name);
    }
    const Json state = StateOf(reg, name);
    r.Set("queue_state", state);
    if (state != wanted) return r.FailWithoutCode("the CUPS queue " + name + " is not " + wanted + " afterwards");
    return r.Succeed();
}

int Remove(const Registry &reg, const QueueArgs &a) {
    Report r(reg.bJson, {"printer_id", "cups_queue", "removed"});
    r.Set("printer_id", a.id);
    const std::string name = CupsNameOf(a.id);
    if (name.empty()) return r.FailWithoutCode("printer " + a.id + " has no CUPS queue name in its section");
    r.Set("cups_queue", name);
    if (StateOf(reg, name) == "missing") return r.FailWithoutCode("nothing to remove: CUPS has no queue " + name);
    ResetPlatformError();
    const int32_t res = a.bNetwork ? XAVOPrinterNetCupsRm(a.id.c_str()) : XAVOPrinterCupsRm(a.id.c_str());
    if (res != 0) return r.Fail("could not remove the CUPS queue " + name + " of " + a.id);
    const Json state = StateOf(reg, name);
    r.Set("removed", state == "missing");
    if (state != "missing") return r.FailWithoutCode("the CUPS queue " + name + " is still there");
    return r.Succeed();
}

int Ppd(const Registry &reg, const std::string &id) {
    Report r(reg.bJson, {"printer_id", "ppd"});
    r.Set("printer_id", id);
    ResetPlatformError();
    std::unique_ptr<char, decltype(&std::free)> text(XAVOCupsGetPPD(id.c_str()), &std::free);
    if (!text) return r.Fail("no PPD file is kept for " + id);
    if (!reg.bJson) {
        // The file itself, as cat would show it; on a terminal with its
        // control characters made harmless, line by line.
        if (isatty(STDOUT_FILENO) != 1) {
            std::fputs(text.get(), stdout);
            return 0;
        }
        std::istringstream lines(text.get());
        for (std::string line; std::getline(lines, line);) std::printf("%s\n", SafeText(line).c_str());
        return 0;
    }
    r.Set("ppd", text.get());
    return r.Succeed();
}

int Check(const Registry &reg, const QueueArgs &a) {
    Report r(reg.bJson, {"printer_id", "cups_name", "name_use"});
    r.Set("printer_id", a.id);
    r.Set("cups_name", a.name);
    ResetPlatformError();
    const int32_t res = XAVOPrinterCupsNameCheck(a.id.c_str(), a.name.c_str());
    if (res < 0) return r.Fail("could not ask CUPS how the queue name " + a.name + " is used");
    static const char *const kMeaning[] = {"free", "in use for this printer", "in use for another device"};
    r.Set("name_use", kMeaning[std::min(res, 2)]);
    return r.Succeed();
}

int PurgeUsb(const Registry &reg) {
    Report r(reg.bJson, {"purged"});
    ResetPlatformError();
    if (XAVOPrinterCupsUsbConfRmAll() != 0) {
        r.Set("purged", false);
        if (ORLICErrGet() == ERR_SERVICE_RUNNING) {
            return r.Fail("cupsd is running: the USB queues are dropped from its printers.conf only while it is stopped");
        }
        return r.Fail("could not drop the USB queues from CUPS's printers.conf");
    }
    r.Set("purged", true);
    return r.Succeed();
}

}  // namespace

void AddQueueCommands(CLI::App &app, Registry &reg) {
    CLI::App *queue = app.add_subcommand("queue", "the printers' CUPS queues");
    auto a = std::make_shared<QueueArgs>();

    CLI::App *add = queue->add_subcommand("add", "create a USB printer's CUPS queue (left disabled)");
    AddArg(add, Arg::kPrinterId, a->id);
    add->add_option("--ppd", a->ppd, "PPD file to install and keep")->check(CLI::ExistingFile);
    reg.On(add, "xavoprinter queue add 04b8:0005:SN0001 --ppd /tmp/printer.ppd", [&reg, a] { return Add(reg, *a); });

    for (const bool bEnable : {true, false}) {
        const std::string verb = bEnable ? "enable" : "disable";
        reg.Leaf(queue, verb, verb + " a CUPS queue", Arg::kQueueName, a->name, "xavoprinter queue " + verb + " usbprinter1",
                 [&reg, a, bEnable] { return Enable(reg, a->name, bEnable); });
    }

    CLI::App *remove = queue->add_subcommand("remove", "remove a printer's CUPS queue");
    AddArg(remove, Arg::kPrinterId, a->id);
    remove->add_flag("--network", a->bNetwork, "the printer is a network printer");
    reg.On(remove, "xavoprinter queue remove 04b8:0005:SN0001", [&reg, a] { return Remove(reg, *a); });

    reg.Leaf(queue, "ppd", "print the PPD file kept for a printer", Arg::kPrinterId, a->id,
             "xavoprinter queue ppd 04b8:0005:SN0001", [&reg, a] { return Ppd(reg, a->id); });

    CLI::App *check = queue->add_subcommand("check", "how a CUPS queue name is used");
    AddArg(check, Arg::kPrinterId, a->id);
    AddArg(check, Arg::kQueueName, a->name);
    reg.On(check, "xavoprinter queue check 04b8:0005:SN0001 usbprinter1", [&reg, a] { return Check(reg, *a); });

    CLI::App *purge = queue->add_subcommand("purge-usb", "drop the USB queues from CUPS's printers.conf (cupsd stopped)");
    reg.On(purge, "xavoprinter queue purge-usb", [&reg] { return PurgeUsb(reg); });
}

}  // namespace cli
