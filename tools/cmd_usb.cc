// usb enable, disable, devid, reset: the usblp devices, as the hotplug
// handler sees them.
#include <sys/stat.h>

#include <memory>
#include <vector>

#include "checks.h"
#include "commands.h"
#include "lists.h"
#include "report.h"
#include "xavoprinter.h"

namespace cli {
namespace {

// The appliance's usblp devices: "lp0" and "lp1".  The library answers
// success and does nothing for any other "lpN".
constexpr int kMaxUsblpNumber = 1;
constexpr char kUsbtab[] = "/tmp/usbtab";

struct UsbArgs {
    std::string dev;
    std::string bus;
};

// Whether the kernel knows a usblp device of this name: the driver's
// class directory in sysfs has an entry for every device it bound.
bool UsblpPresent(const std::string &dev) {
    const std::string name = dev.substr(dev.find_last_of('/') + 1);
    struct stat st{};
    return stat(("/sys/class/usbmisc/" + name).c_str(), &st) == 0;
}

// "lp7" -> 7; -1 for names that are not "lp" and digits.
int UsblpNumber(const std::string &dev) {
    if (!dev.starts_with("lp") || dev.size() == 2 || dev.size() > 6) return -1;
    if (dev.find_first_not_of("0123456789", 2) != std::string::npos) return -1;
    return std::stoi(dev.substr(2));
}

std::string DeviceProblem(const std::string &dev, const std::string &what) {
    if (!UsblpPresent(dev)) return "no usblp device " + dev + " (not present)";
    return "usblp device " + dev + " " + what;
}

int Enable(const Registry &reg, const UsbArgs &a) {
    Report r(reg.bJson, {"device", "bus", "registered"});
    r.Set("device", a.dev);
    r.Set("bus", a.bus);
    ResetPlatformError();
    if (XAVOPrinterEnableExt(1, a.dev.c_str(), a.bus.c_str()) != 0) {
        r.Set("registered", false);
        return r.Fail("could not register the USB printer on " + a.dev + " (bus " + a.bus + ")");
    }
    const bool bInTable = Contains(UsbtabDevices(), a.dev);
    r.Set("registered", bInTable);
    if (bInTable) return r.Succeed();
    if (UsblpNumber(a.dev) > kMaxUsblpNumber) {
        return r.FailWithoutCode(a.dev + " was not registered: the appliance supports lp0 and lp1 only");
    }
    return r.FailWithoutCode(a.dev + " was not registered: no line for it in " + kUsbtab);
}

int Disable(const Registry &reg, const UsbArgs &a) {
    Report r(reg.bJson, {"device", "bus", "forgotten"});
    r.Set("device", a.dev.empty() ? Json(nullptr) : Json(a.dev));
    r.Set("bus", a.bus.empty() ? Json(nullptr) : Json(a.bus));
    const std::vector<std::string> before = UsbtabDevices();
    ResetPlatformError();
    if (XAVOPrinterEnableExt(0, a.dev.empty() ? nullptr : a.dev.c_str(), a.bus.empty() ? nullptr : a.bus.c_str()) != 0) {
        return r.Fail("could not forget the USB printer");
    }
    Json gone = Json::array();
    const std::vector<std::string> after = UsbtabDevices();
    for (const std::string &dev : before) {
        if (!Contains(after, dev)) gone.push_back(dev);
    }
    r.Set("forgotten", gone);
    if (gone.empty()) {
        const std::string what = a.dev.empty() ? "bus " + a.bus : a.dev + (a.bus.empty() ? "" : " on bus " + a.bus);
        return r.FailWithoutCode("nothing to forget: no line for " + what + " in " + kUsbtab);
    }
    return r.Succeed();
}

int Devid(const Registry &reg, const std::string &dev) {
    Report r(reg.bJson, {"device", "device_id", "stated_length", "brand", "model"});
    r.Set("device", dev);
    std::vector<char> buf(4096, '\0');
    ResetPlatformError();
    const int32_t n = XAVOPrinterGetStringId(dev.c_str(), buf.data(), static_cast<int32_t>(buf.size()));
    if (n < 0) return r.Fail(DeviceProblem(dev, "did not answer the device ID request"));
    r.Set("device_id", std::string(buf.data()));
    if (n > 0) {
        r.Set("stated_length", n);
        r.Note("the device states a longer ID than the buffer holds: shown cut");
    }
    char szBrand[128] = {}, szModel[128] = {};
    if (XAVOPrinterConfStringIdGetVendor(buf.data(), szBrand, sizeof szBrand) == 0) r.Set("brand", szBrand);
    if (XAVOPrinterConfStringIdGetModel(buf.data(), szModel, sizeof szModel) == 0) r.Set("model", szModel);
    return r.Succeed();
}

int Reset(const Registry &reg, const std::string &dev) {
    Report r(reg.bJson, {"device", "reset"});
    r.Set("device", dev);
    ResetPlatformError();
    if (XAVOResetPrinter(dev.c_str()) != 0) {
        r.Set("reset", false);
        return r.Fail(DeviceProblem(dev, "refused the soft reset"));
    }
    r.Set("reset", true);
    return r.Succeed();
}

}  // namespace

void AddUsbCommands(CLI::App &app, Registry &reg) {
    CLI::App *usb = app.add_subcommand("usb", "USB printers on the usblp devices lp0 and lp1");
    auto a = std::make_shared<UsbArgs>();
    CLI::App *enable = usb->add_subcommand("enable", "register a plugged-in USB printer (as the hotplug handler does)");
    AddArg(enable, Arg::kDevice, a->dev);
    enable->add_option("BUS", a->bus, "USB bus ID of the device, such as 1-1.2")->required()->check(Text(kMaxField));
    reg.On(enable, "xavoprinter usb enable lp0 1-1.2", [&reg, a] { return Enable(reg, *a); });

    CLI::App *disable = usb->add_subcommand("disable", "forget an unplugged USB printer, by device name and/or bus ID");
    disable->add_option("DEV", a->dev, kDeviceHelp)->check(Text(kMaxField));
    disable->add_option("BUS", a->bus, "USB bus ID")->check(Text(kMaxField));
    disable->add_option("--bus", a->bus, "USB bus ID (prefix) of the printers to forget, without DEV")
        ->check(Text(kMaxField));
    reg.On(
        disable, "xavoprinter usb disable lp0   |   xavoprinter usb disable --bus 1-1",
        [&reg, a] { return Disable(reg, *a); },
        [a] { return a->dev.empty() && a->bus.empty() ? "give DEV, --bus BUS, or both" : ""; });

    reg.Leaf(usb, "devid", "ask a usblp device for its IEEE 1284 device ID string", Arg::kDevice, a->dev,
             "xavoprinter usb devid lp0", [&reg, a] { return Devid(reg, a->dev); });
    reg.Leaf(usb, "reset", "soft-reset a usblp device", Arg::kDevice, a->dev, "xavoprinter usb reset lp0",
             [&reg, a] { return Reset(reg, a->dev); });
}

}  // namespace cli
