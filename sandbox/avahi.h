// A real Avahi mDNS responder (Debian's avahi-daemon) on the sandbox's
// loopback, announcing printers the way network printers announce
// themselves, and the real avahi-browse at the appliance's path
// "/usr/xavo/sbin/avahi-browse" (a link to /usr/bin/avahi-browse).
//
//     AvahiResponder avahi({{"laser", "127.0.0.1", "Office Laser",
//                            {{"_ipp._tcp", 631, {"usb_MDL=Laser 100"}}}}});
//     ASSERT_TRUE(avahi.ready());
//
// The browser reaches the daemon only through the D-Bus system bus, so the
// responder brings a bus of its own: a dbus-daemon on the sandbox's
// /run/dbus/system_bus_socket with a private configuration that lets every
// local client own and call everything.  Each printer is a static host name
// ("laser.local") mapped in /etc/avahi/hosts to an address of 127/8 (all of
// it is local on lo) and a service group file in /etc/avahi/services, so a
// resolved service carries the printer's own address, not the daemon's.
// The daemon publishes no address of its own (its host name would claim
// 127.0.0.1 as well) and listens on lo only, IPv4 only.
//
// A program that registers its services over D-Bus, as CUPS's ippeveprinter
// does, cannot name a host: its services carry the daemon's own host name
// "xavo-sandbox.local".  Given an address (ownAddress), that name is mapped
// to it like a printer's static host name, so that the services resolve to
// the program's own address; without one they do not resolve at all.
//
// Starting costs about a second: avahi probes each name before it claims
// it.  ready() is true once every host name and service group is
// established; from then on a browse resolves all of them.  A browse with
// "-t" itself takes about a second (the daemon's wait for answers before
// it reports "all for now"), whatever it finds.
//
// Both daemons run in the foreground as children of the test process and
// are stopped by their own pids, the responder before its bus.  Their
// messages go to files under /tmp/xavo-avahi, not to the captured syslog.
#pragma once

#include <fcntl.h>
#include <net/if.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <string>
#include <vector>

#include "sandbox/daemon.h"
#include "sandbox/sandbox.h"

namespace xavo::test {

struct MdnsService {
    std::string type;              // "_ipp._tcp"
    int port;                      // 631
    std::vector<std::string> txt;  // "usb_MDL=Laser 100"; none: no TXT strings at all
};

struct MdnsPrinter {
    std::string host;      // "laser": announced as "laser.local"
    std::string address;   // "127.0.0.1"
    std::string instance;  // the service name users see, "Office Laser"
    std::vector<MdnsService> services;
};

class AvahiResponder {
public:
    static constexpr char kDir[] = "/tmp/xavo-avahi";
    static constexpr char kBusSocket[] = "/run/dbus/system_bus_socket";
    static constexpr char kBrowsePath[] = "/usr/xavo/sbin/avahi-browse";
    static constexpr char kOwnHost[] = "xavo-sandbox";

    explicit AvahiResponder(const std::vector<MdnsPrinter> &printers, const std::string &ownAddress = "") {
        WriteConfiguration(printers, ownAddress);
        EnableLoopbackMulticast();
        mkdir("/run/dbus", 0755);
        mkdir("/usr/xavo/sbin", 0755);
        unlink(kBrowsePath);
        symlink("/usr/bin/avahi-browse", kBrowsePath);

        std::string busConf = std::string(kDir) + "/bus.conf";
        bus_ = StartDaemon({"/usr/bin/dbus-daemon", "--nofork", "--nopidfile", "--config-file=" + busConf},
                     std::string(kDir) + "/bus.log");
        for (int i = 0; i < 250 && bus_ > 0 && !FileExists(kBusSocket); ++i) poll(nullptr, 0, 20);
        if (!FileExists(kBusSocket)) return;

        std::string log = std::string(kDir) + "/daemon.log";
        daemon_ = StartDaemon({"/usr/sbin/avahi-daemon", "-f", std::string(kDir) + "/avahi-daemon.conf", "--no-drop-root",
                         "--no-chroot", "--no-rlimits"},
                        log);
        // One line for each static host name and one for each service group.
        const size_t expected = 2 * printers.size() + (ownAddress.empty() ? 0 : 1);
        for (int i = 0; i < 500 && DaemonRunning(daemon_) && !ready_; ++i) {
            ready_ = Count(ReadFile(log), "successfully established") >= expected;
            if (!ready_) poll(nullptr, 0, 20);
        }
    }
    AvahiResponder(const AvahiResponder &) = delete;
    AvahiResponder &operator=(const AvahiResponder &) = delete;
    ~AvahiResponder() {
        StopDaemon(daemon_);
        StopDaemon(bus_);
    }

    bool ready() const { return ready_ && DaemonRunning(daemon_) && DaemonRunning(bus_); }
    // What the daemon said, for a failure message.
    static std::string DaemonLog() { return ReadFile(std::string(kDir) + "/daemon.log"); }

private:
    static std::string Xml(const std::string &text) {
        std::string out;
        for (char c : text) {
            if (c == '&') out += "&amp;";
            else if (c == '<') out += "&lt;";
            else if (c == '>') out += "&gt;";
            else out += c;
        }
        return out;
    }

    static void WriteConfiguration(const std::vector<MdnsPrinter> &printers, const std::string &ownAddress) {
        PlaceFile(std::string(kDir) + "/bus.conf",
                  "<!DOCTYPE busconfig PUBLIC \"-//freedesktop//DTD D-Bus Bus Configuration 1.0//EN\"\n"
                  " \"http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd\">\n"
                  "<busconfig>\n"
                  "  <type>system</type>\n"
                  "  <listen>unix:path=/run/dbus/system_bus_socket</listen>\n"
                  "  <auth>EXTERNAL</auth>\n"
                  "  <policy context=\"default\">\n"
                  "    <allow user=\"*\"/>\n"
                  "    <allow own=\"*\"/>\n"
                  "    <allow send_destination=\"*\"/>\n"
                  "    <allow receive_sender=\"*\"/>\n"
                  "  </policy>\n"
                  "</busconfig>\n");
        PlaceFile(std::string(kDir) + "/avahi-daemon.conf",
                  "[server]\n"
                  "host-name=" + std::string(kOwnHost) + "\n"
                  "domain-name=local\n"
                  "use-ipv4=yes\n"
                  "use-ipv6=no\n"
                  "allow-interfaces=lo\n"
                  "enable-dbus=yes\n"
                  "disallow-other-stacks=no\n"
                  "ratelimit-interval-usec=1000000\n"
                  "ratelimit-burst=1000\n"
                  "[wide-area]\n"
                  "enable-wide-area=no\n"
                  "[publish]\n"
                  "publish-addresses=no\n"
                  "publish-hinfo=no\n"
                  "publish-workstation=no\n"
                  "publish-domain=no\n");
        std::string hosts = ownAddress.empty() ? "" : ownAddress + " " + kOwnHost + ".local\n";
        for (const MdnsPrinter &p : printers) {
            hosts += p.address + " " + p.host + ".local\n";
            std::string group =
                "<?xml version=\"1.0\" standalone='no'?>\n<service-group>\n  <name>" + Xml(p.instance) + "</name>\n";
            for (const MdnsService &s : p.services) {
                group += "  <service>\n    <type>" + s.type + "</type>\n    <port>" + std::to_string(s.port) +
                         "</port>\n    <host-name>" + p.host + ".local</host-name>\n";
                for (const std::string &t : s.txt) group += "    <txt-record>" + Xml(t) + "</txt-record>\n";
                group += "  </service>\n";
            }
            PlaceFile("/etc/avahi/services/" + p.host + ".service", group + "</service-group>\n");
        }
        PlaceFile("/etc/avahi/hosts", hosts);
    }

    // A network printer's interface is multicast-capable; the sandbox's lo
    // is brought up without the flag.  Only this sandbox's namespace sees it.
    static void EnableLoopbackMulticast() {
        int fd = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        if (fd < 0) return;
        ifreq ifr{};
        std::strncpy(ifr.ifr_name, "lo", IFNAMSIZ - 1);
        if (ioctl(fd, SIOCGIFFLAGS, &ifr) == 0) {
            ifr.ifr_flags = static_cast<short>(ifr.ifr_flags | IFF_MULTICAST);
            ioctl(fd, SIOCSIFFLAGS, &ifr);
        }
        close(fd);
    }

    static size_t Count(const std::string &text, const char *szWhat) {
        size_t n = 0;
        for (size_t at = text.find(szWhat); at != std::string::npos; at = text.find(szWhat, at + 1)) ++n;
        return n;
    }

    pid_t bus_ = -1;
    pid_t daemon_ = -1;
    bool ready_ = false;
};

}  // namespace xavo::test
