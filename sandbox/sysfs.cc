// The fake sysfs: the USB devices a test plugs in, laid out as the kernel
// shows a usblp printer.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace xavo::test {
namespace detail {
namespace {

constexpr char kUsbRoot[] = "/sys/devices/pci0000:00/0000:00:14.0/usb1";
constexpr char kClassDir[] = "/sys/class/usbmisc";
constexpr char kBusDir[] = "/sys/bus/usb/devices";
// Character major of the usbmisc class (usblp's minors start at 0).
constexpr int kUsbMiscMajor = 180;

std::string Hex(unsigned value, int width) {
    char buf[16];
    std::snprintf(buf, sizeof buf, "%0*x\n", width, value);
    return buf;
}

void Link(const std::string &target, const std::string &link) {
    if (symlink(target.c_str(), link.c_str()) != 0) ThrowErrno(errno, "symlink", link);
}

int MinorOf(const std::string &devName) {
    const auto digits = devName.find_last_not_of("0123456789");
    const std::string number = devName.substr(digits == std::string::npos ? 0 : digits + 1);
    return number.empty() ? 0 : std::atoi(number.c_str());
}

void CheckPart(const std::string &part, const char *what) {
    if (part.empty() || part.find('/') != std::string::npos || part == "." || part == "..") {
        ThrowErrno(EINVAL, what, part);
    }
}

}  // namespace

void RestoreSysfs() {
    MakeDirs(kUsbRoot);
    MakeDirs(kClassDir);
    MakeDirs(kBusDir);
}

}  // namespace detail

using namespace detail;

void PlugUsbDevice(const UsbDevice &device) {
    CheckPart(device.busId, "USB bus ID");
    CheckPart(device.devName, "usbmisc name");
    if (FileExists(std::string(kClassDir) + "/" + device.devName)) {
        ThrowErrno(EEXIST, "already plugged:", device.devName);
    }
    const std::string dir = std::string(kUsbRoot) + "/" + device.busId;
    const std::string intf = device.busId + ":1.0";
    const std::string misc = dir + "/" + intf + "/usbmisc/" + device.devName;
    PlaceFile(dir + "/idVendor", Hex(device.vendor, 4));
    PlaceFile(dir + "/idProduct", Hex(device.product, 4));
    if (!device.serial.empty()) PlaceFile(dir + "/serial", device.serial + "\n");
    PlaceFile(dir + "/manufacturer", device.manufacturer + "\n");
    PlaceFile(dir + "/product", device.productName + "\n");
    PlaceFile(dir + "/" + intf + "/bInterfaceClass", Hex(static_cast<unsigned>(device.interfaceClass), 2));
    const int minor = MinorOf(device.devName);
    PlaceFile(misc + "/dev", std::to_string(kUsbMiscMajor) + ":" + std::to_string(minor) + "\n");
    PlaceFile(misc + "/uevent", "MAJOR=" + std::to_string(kUsbMiscMajor) + "\nMINOR=" + std::to_string(minor) +
                                    "\nDEVNAME=usb/" + device.devName + "\n");
    Link("../../../" + intf, misc + "/device");
    const std::string fromClass = "../../devices/pci0000:00/0000:00:14.0/usb1/" + device.busId;
    Link(fromClass + "/" + intf + "/usbmisc/" + device.devName, std::string(kClassDir) + "/" + device.devName);
    const std::string fromBus = "../../../devices/pci0000:00/0000:00:14.0/usb1/" + device.busId;
    if (!FileExists(std::string(kBusDir) + "/" + device.busId)) {
        Link(fromBus, std::string(kBusDir) + "/" + device.busId);
        Link(fromBus + "/" + intf, std::string(kBusDir) + "/" + intf);
    }
}

void UnplugUsbDevice(const std::string &devName) {
    CheckPart(devName, "usbmisc name");
    const std::string classLink = std::string(kClassDir) + "/" + devName;
    char target[4096];
    const ssize_t n = readlink(classLink.c_str(), target, sizeof target - 1);
    if (n < 0) ThrowErrno(errno, "not plugged:", devName);
    target[n] = '\0';
    // ".../usb1/<busId>/<busId>:1.0/usbmisc/<devName>"
    const std::string rel = target;
    const std::string marker = "/usb1/";
    const auto at = rel.find(marker);
    const std::string busId = rel.substr(at + marker.size(), rel.find('/', at + marker.size()) - at - marker.size());
    RemoveTree(classLink);
    RemoveTree(std::string(kBusDir) + "/" + busId);
    RemoveTree(std::string(kBusDir) + "/" + busId + ":1.0");
    RemoveTree(std::string(kUsbRoot) + "/" + busId);
}

}  // namespace xavo::test
