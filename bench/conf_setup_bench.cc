// The configuration store against its floor: XAVOPrinterConfSetup,
// XAVOPrinterNetConfSetup and XAVOPrinterGoogleInfoSet, each replacing one
// section in the middle of a printer.conf of 100 to 10,000 sections,
// against the least a replace of that file must do: read it, write a
// temporary file beside it, fsync, rename.
//
// Figures: the ratio at 1,000 sections (goal 2.0); the time per byte at
// 10,000 sections against that at 100 (goal 1.5: the cost grows no faster
// than the file); the growth exponent over 625, 2,500 and 10,000 sections
// (goal 1.15).  All of it is the calling thread's CPU time, on tmpfs.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "bench/bench.h"
#include "xavoprinter.h"

namespace {

using xavo::bench::Must;
using xavo::bench::Stats;

constexpr char kConfPath[] = "/usr/xavo/etc/printer.conf";
constexpr int kSizes[] = {100, 625, 1000, 2500, 10000};

std::string UsbId(int i) {
    char id[32];
    std::snprintf(id, sizeof id, "04b8:0005:SN%05d", i);
    return id;
}
std::string NetIp(int i) { return "10.1." + std::to_string(i / 250) + "." + std::to_string(i % 250 + 1); }
std::string NetId(int i) { return NetIp(i) + "-net" + std::to_string(i); }

// n sections: USB and network printers taking turns, the cloud print
// section in the middle.
std::string ConfText(int n) {
    std::string text;
    for (int i = 0; i < n; ++i) {
        if (i == n / 2) text += "[Google Cloud Print]\n\tgoogle account = someone@example.com\n";
        if (i % 2 == 0) {
            text += "[" + UsbId(i) + "]\n\tproducer = ACME\n\tproduct name = Model 100\n\tmode = lpr\n"
                    "\tusblp string id = MFG:ACME;MDL:Model 100;CMD:ESCPL2,PCL;CLS:PRINTER;\n"
                    "\tcups printer name = usbprinter1\n";
        } else {
            text += "[" + NetId(i) + "]\n\tIP = " + NetIp(i) + "\n\tcups printer name = net" + std::to_string(i) +
                    "\n\tBackend = socket\n\tQName = \n\tBrand = ACME\n\tModel = Laser 5\n";
        }
    }
    return text;
}

// The floor: read the file whole, write it to a temporary file beside it,
// fsync, rename over it.
void MinimalReplace() {
    int fd = open(kConfPath, O_RDONLY | O_CLOEXEC);
    Must(fd >= 0, "open printer.conf");
    struct stat st {};
    fstat(fd, &st);
    std::string text(static_cast<size_t>(st.st_size), '\0');
    Must(read(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()), "read printer.conf");
    close(fd);
    std::string tmp = std::string(kConfPath) + ".bench";
    fd = open(tmp.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    Must(fd >= 0, "create the temporary file");
    Must(write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()), "write the temporary file");
    Must(fsync(fd) == 0 && close(fd) == 0, "fsync");
    Must(rename(tmp.c_str(), kConfPath) == 0, "rename");
}

struct Records {
    UsbPrinterConf usb{};
    NetPrinterConf net{};
    PrinterGoogleInfo google{};
};

Records RecordsFor(int n) {
    Records r;
    int mid = n / 2 - (n / 2) % 2;  // a USB section in the middle
    std::snprintf(r.usb.szPrinterId, sizeof r.usb.szPrinterId, "%s", UsbId(mid).c_str());
    std::snprintf(r.usb.szProducer, sizeof r.usb.szProducer, "ACME");
    std::snprintf(r.usb.szMode, sizeof r.usb.szMode, "lpr");
    std::snprintf(r.usb.szDriver, sizeof r.usb.szDriver, "acme-100.ppd");
    std::snprintf(r.net.szPrinterId, sizeof r.net.szPrinterId, "%s", NetId(mid + 1).c_str());
    std::snprintf(r.net.szIP, sizeof r.net.szIP, "%s", NetIp(mid + 1).c_str());
    std::snprintf(r.net.szBackend, sizeof r.net.szBackend, "socket");
    std::snprintf(r.net.szBrand, sizeof r.net.szBrand, "ACME");
    std::snprintf(r.google.szAccount, sizeof r.google.szAccount, "someone@example.com");
    std::snprintf(r.google.szRefreshToken, sizeof r.google.szRefreshToken, "token-0123456789");
    return r;
}

constexpr const char *kNames[] = {"XAVOPrinterConfSetup", "XAVOPrinterNetConfSetup", "XAVOPrinterGoogleInfoSet"};

// Per-call milliseconds of the floor and the three setups at n sections.
std::vector<double> Measure(const xavo::bench::Options &o, int n) {
    xavo::test::PlaceFile(kConfPath, ConfText(n));
    const Records r = RecordsFor(n);
    const int reps = n >= 10000 ? 2 : std::max(2, 20000 / n);
    auto repeat = [reps](auto call) {
        return [reps, call] {
            for (int i = 0; i < reps; ++i) call();
        };
    };
    std::printf("  %d sections (%lld bytes), %d calls a round:\n", n,
                static_cast<long long>(xavo::test::ReadFile(kConfPath).size()), reps);
    std::vector<Stats> stats = xavo::bench::Interleaved(
        o, xavo::bench::Clock::kThreadCpu, {
               {"minimal replace", repeat(MinimalReplace)},
               {kNames[0], repeat([&r] { Must(XAVOPrinterConfSetup(&r.usb, 0) == 0, kNames[0]); })},
               {kNames[1], repeat([&r] { Must(XAVOPrinterNetConfSetup(&r.net, 0) == 0, kNames[1]); })},
               {kNames[2], repeat([&r] { Must(XAVOPrinterGoogleInfoSet(&r.google) == 0, kNames[2]); })},
           });
    std::vector<double> perCall;
    for (const Stats &s : stats) perCall.push_back(s.median / reps);
    return perCall;
}

int Run(const xavo::bench::Options &o) {
    std::vector<std::vector<double>> times;  // [size][candidate]
    std::vector<double> bytes;
    for (int n : kSizes) {
        times.push_back(Measure(o, n));
        bytes.push_back(static_cast<double>(xavo::test::ReadFile(kConfPath).size()));
    }
    xavo::bench::Verdicts v;
    const size_t at1000 = 2, at100 = 0, at10000 = 4;
    for (size_t f = 0; f < 3; ++f) {
        const size_t c = f + 1;
        v.Report(std::string(kNames[f]) + " at 1000 sections against the minimal replace",
                 times[at1000][c] / times[at1000][0], 2.0);
        v.Report(std::string(kNames[f]) + " time per byte, 10000 against 100 sections",
                 (times[at10000][c] / bytes[at10000]) / (times[at100][c] / bytes[at100]), 1.5);
        v.Report(std::string(kNames[f]) + " growth exponent over 625, 2500, 10000 sections",
                 xavo::bench::GrowthExponent({bytes[1], bytes[3], bytes[4]}, {times[1][c], times[3][c], times[4][c]}),
                 1.15);
    }
    return v.ExitCode();
}

}  // namespace

int main(int argc, char **argv) {
    const xavo::bench::Options o = xavo::bench::ParseOptions(argc, argv, 11);
    return xavo::bench::Main([&] { return Run(o); });
}
