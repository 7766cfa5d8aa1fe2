// list, show: the appliance's printers as its files and CUPS see them.
#include <memory>
#include <vector>

#include "checks.h"
#include "commands.h"
#include "cups_query.h"
#include "lists.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

int List(const Registry &reg) {
    Report r(reg.bJson, {"count", "printers"});
    ResetPlatformError();
    ORLICSzList *raw = nullptr;
    const int32_t n = XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET, &raw);
    OwnedList all(raw);
    if (n < 0) return r.Fail("the printers could not be listed");
    const std::vector<std::string> usbIds = UsbPrinterIds();
    const std::optional<Queues> queues = AskQueues(reg.bVerbose);
    if (!queues) r.Note("CUPS could not be asked (is cupsd running?): queue states unknown");
    Json rows = Json::array();
    for (const std::string &id : Items(all.get())) {
        const bool bUsb = Contains(usbIds, id);
        const std::string name = CupsNameOf(id);
        Json state = nullptr;
        if (!name.empty() && queues) state = QueueStateName(queues->StateOf(name));
        char szLock[256] = {};
        Json lock = nullptr;
        if (XAVOPrinterUsbipGetLockStatus(id.c_str(), szLock, sizeof szLock) == 0) lock = szLock;
        rows.push_back(Json{{"id", id},
                            {"kind", bUsb ? "usb" : "network"},
                            {"cups_queue", name.empty() ? Json(nullptr) : Json(name)},
                            {"queue_state", state},
                            {"usbip_lock", lock}});
    }
    r.Set("count", n);
    r.SetTable("printers", rows);
    return r.Succeed();
}

int Show(const Registry &reg, const std::string &id) {
    Report r(reg.bJson, {"id", "keys"});
    r.Set("id", id);
    ResetPlatformError();
    OwnedHash hash(ORLICSzHashAlloc(512));
    if (!hash) return r.Fail("no memory for the printer's section");
    if (ReadSection(id, hash) <= 0) return r.FailWithoutCode("no printer " + id + " in " + kPrinterConf);
    Json keys = Json::array();
    for (const std::string &key : HashKeys(hash.get())) {
        const char *value = ORLICSzHashGetValue(hash.get(), key.c_str());
        // The cloud print secrets are enciphered, not hidden: shown only
        // by "cloud get --reveal".
        const bool bSecret = key == "google pass" || key == "refresh token";
        keys.push_back(Json{{"key", key}, {"value", bSecret ? Json(nullptr) : Json(value ? value : "")}});
    }
    r.SetTable("keys", keys);
    return r.Succeed();
}

}  // namespace

void AddPrinterCommands(CLI::App &app, Registry &reg) {
    CLI::App *list = app.add_subcommand(
        "list", "every printer: ID, kind, CUPS queue and its state (enabled, disabled, missing), USB/IP lock");
    reg.On(list, "xavoprinter list --json", [&reg] { return List(reg); });

    auto id = std::make_shared<std::string>();
    reg.Leaf(&app, "show", "the printer's section of the printer configuration file", Arg::kPrinterId, *id,
             "xavoprinter show 04b8:0005:SN0001", [&reg, id] { return Show(reg, *id); });
}

}  // namespace cli
