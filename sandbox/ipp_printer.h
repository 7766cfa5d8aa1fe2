// A network printer that speaks IPP and makes itself known only by mDNS:
// CUPS's ippeveprinter (Debian's cups-ipp-utils) on a loopback address of
// its own, announcing its services through the sandbox's avahi-daemon
// (AvahiResponder), and keeping every document it is sent.
//
//     AvahiResponder avahi({}, IppPrinter::kIpv4);   // its services resolve there
//     IppPrinter printer;
//     ASSERT_TRUE(printer.ready());
//     ... print to ipp://127.0.0.2/ipp/print ...
//     EXPECT_EQ(printer.WaitForDocument(want.size(), 10000), want);
//
// Addresses: ippeveprinter listens on the addresses its host name ("-n")
// resolves to, and refuses to start without both an IPv4 and an IPv6
// listener.  The sandbox's /etc/hosts maps kHost to 127.0.0.2 (all of
// 127/8 is local on lo) and to a unique local IPv6 address that this
// class adds to lo; ::1 would not do, since the resolver answers an IPv4
// lookup of a name listed for ::1 with 127.0.0.1, the address of the
// sandbox's other network printer.
//
// Announcement: ippeveprinter registers its services over D-Bus and cannot
// name a host for them, so they carry the daemon's own host name; the
// AvahiResponder must map that name to kIpv4.  ready() is true once the
// printer accepts connections and a browse resolves its IPP service at
// kIpv4 (about two seconds: the daemon probes the names first).
//
// Documents: the printer's "print command" is /bin/true, so a job is done
// as soon as it has arrived (without one ippeveprinter pretends to print
// for 5 to 15 seconds); with "-k" the document stays in the spool
// directory, as "<job>-<title>.dat" for the raw documents CUPS sends.
//
// The printer runs in the foreground as a child of the process that starts
// it and is stopped by its own pid; its messages go to a file under
// kSpool, not to the captured syslog.
#pragma once

#include <arpa/inet.h>
#include <dirent.h>
#include <net/if.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <string>
#include <vector>

#include "sandbox/avahi.h"
#include "sandbox/daemon.h"
#include "sandbox/sandbox.h"

namespace xavo::test {

class IppPrinter {
public:
    static constexpr char kHost[] = "jet7";
    static constexpr char kIpv4[] = "127.0.0.2";
    static constexpr char kIpv6[] = "fd00:78a0::2";
    static constexpr int kPort = 631;  // the IPP port: CUPS's ipp backend needs no port in the URI
    static constexpr char kResource[] = "ipp/print";  // ippeveprinter's own, announced as the TXT key "rp"
    static constexpr char kMake[] = "ACME";
    static constexpr char kModel[] = "Jet 7";
    static constexpr char kSpool[] = "/tmp/xavo-ippeve";

    IppPrinter() {
        const std::string spool = kSpool;
        for (const std::string &dir : {spool, spool + "/jobs", spool + "/keys"}) mkdir(dir.c_str(), 0700);
        PlaceFile("/etc/hosts", ReadFile("/etc/hosts") + kIpv4 + " " + kHost + "\n" + kIpv6 + " " + kHost + "\n");
        AddIpv6ToLoopback();
        // Its TLS keys and anything it keeps per user stay in the sandbox's
        // tmpfs, whatever HOME the demo was started with.
        pid_ = StartDaemon({"/usr/sbin/ippeveprinter", "-n", kHost, "-p", std::to_string(kPort), "-M", kMake, "-m",
                            kModel, "-d", spool + "/jobs", "-k", "-K", spool + "/keys", "-c", "/bin/true", "-f",
                            "application/octet-stream,text/plain", std::string(kMake) + " " + kModel},
                           spool + "/ippeveprinter.log",
                           {"HOME=" + spool, "TMPDIR=" + spool, "PATH=/usr/sbin:/usr/bin:/sbin:/bin", "LANG=C.UTF-8"});
        for (int i = 0; i < 250 && Alive() && !Accepts(); ++i) poll(nullptr, 0, 20);
        for (int i = 0; i < 5 && Alive() && Accepts() && !ready_; ++i) ready_ = Announced();
    }
    IppPrinter(const IppPrinter &) = delete;
    IppPrinter &operator=(const IppPrinter &) = delete;
    ~IppPrinter() { StopDaemon(pid_); }

    bool ready() const { return ready_ && Alive(); }
    pid_t pid() const { return pid_; }
    // What the printer said, for a failure message.
    static std::string Log() { return ReadFile(std::string(kSpool) + "/ippeveprinter.log"); }

    // The first document kept in the spool once it holds at least size
    // bytes, or what there is after timeoutMs ("" for none).
    static std::string WaitForDocument(size_t size, int timeoutMs) {
        std::string got;
        for (int waited = 0; waited <= timeoutMs; waited += 50) {
            got = FirstDocument();
            if (got.size() >= size) break;
            poll(nullptr, 0, 50);
        }
        return got;
    }

private:
    static std::string FirstDocument() {
        const std::string dir = std::string(kSpool) + "/jobs";
        DIR *d = opendir(dir.c_str());
        if (d == nullptr) return "";
        std::string name;
        for (dirent *e = readdir(d); e != nullptr && name.empty(); e = readdir(d)) {
            // "N-title.prn" beside the document "N-title.dat" holds what the
            // print command wrote (nothing).
            const std::string entry = e->d_name;
            if (entry[0] != '.' && !entry.ends_with(".prn")) name = entry;
        }
        closedir(d);
        return name.empty() ? "" : ReadFile(dir + "/" + name);
    }

    // lo of the sandbox's namespace; gone with it.  Adding it again is
    // refused (EEXIST), which is as good.
    static void AddIpv6ToLoopback() {
        struct {
            in6_addr addr;
            std::uint32_t prefixLen;
            int ifIndex;
        } req{};  // the kernel's struct in6_ifreq
        if (inet_pton(AF_INET6, kIpv6, &req.addr) != 1) return;
        req.prefixLen = 128;
        req.ifIndex = static_cast<int>(if_nametoindex("lo"));
        int fd = socket(AF_INET6, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        if (fd < 0) return;
        ioctl(fd, SIOCSIFADDR, &req);
        close(fd);
    }

    bool Alive() const { return DaemonRunning(pid_); }

    static bool Accepts() {
        int fd = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (fd < 0) return false;
        sockaddr_in addr{};
        addr.sin_family = AF_INET;
        addr.sin_port = htons(kPort);
        inet_pton(AF_INET, kIpv4, &addr.sin_addr);
        const bool bOk = connect(fd, reinterpret_cast<sockaddr *>(&addr), sizeof addr) == 0;
        close(fd);
        return bOk;
    }

    // One browse of the IPP services, resolved, as the library's browse
    // sees them; a line for the printer ends in ";<address>;<port>;TXT".
    static bool Announced() {
        const std::string out = std::string(kSpool) + "/browse.out";
        unlink(out.c_str());
        pid_t browse = StartDaemon({AvahiResponder::kBrowsePath, "-rpt", "_ipp._tcp"}, out);
        for (int waited = 0; waited < 5000 && DaemonRunning(browse); waited += 20) poll(nullptr, 0, 20);
        StopDaemon(browse, 0);
        return ReadFile(out).find(std::string(";") + kIpv4 + ";" + std::to_string(kPort) + ";") != std::string::npos;
    }

    pid_t pid_ = -1;
    bool ready_ = false;
};

}  // namespace xavo::test
