// Nothing left behind: 10,000 calls of the library's file and table
// operations in one process, taking turns (setups of the three kinds of
// section, the CUPS name lookup, adding and removing a network printer with
// its Samba share, the listings and counts, the cloud account, a device ID
// string), after a warm-up of 1,000.  Figures: the growth of the resident
// set in KiB (goal 64) and of the open descriptors (goal 0).
#include <dirent.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

#include "bench/bench.h"
#include "internal/guards.h"
#include "xavoprinter.h"

namespace {

using xavo::bench::Must;

constexpr char kPrinterId[] = "04b8:0005:SN0001";

long ResidentKiB() {
    FILE *f = std::fopen("/proc/self/statm", "r");
    Must(f != nullptr, "reading /proc/self/statm");
    long size = 0, resident = 0;
    Must(std::fscanf(f, "%ld %ld", &size, &resident) == 2, "reading /proc/self/statm");
    std::fclose(f);
    return resident * (sysconf(_SC_PAGESIZE) / 1024);
}

long OpenDescriptors() {
    DIR *d = opendir("/proc/self/fd");
    Must(d != nullptr, "listing /proc/self/fd");
    long n = 0;
    while (readdir(d) != nullptr) ++n;
    closedir(d);
    return n;
}

struct Records {
    UsbPrinterConf usb{};
    NetPrinterConf net{};
    PrinterGoogleInfo google{};
};

std::vector<std::function<void()>> Calls(const Records &r) {
    return {
        [&r] { Must(XAVOPrinterConfSetup(&r.usb, 1) == 0, "XAVOPrinterConfSetup"); },
        [] {
            char name[128];
            Must(XAVOPrinterCupsNameGet(kPrinterId, name, sizeof name) == 0, "XAVOPrinterCupsNameGet");
        },
        [&r] { Must(XAVOPrinterNetConfSetup(&r.net, 0) == 0, "XAVOPrinterNetConfSetup"); },
        [&r] { Must(XAVOPrinterNetUpdateConf(1, &r.net) == 0, "XAVOPrinterNetUpdateConf add"); },
        [] {
            xavo::SzList list(ORLICSzListAlloc(256));
            Must(XAVOPrinterNetNptabEnum(list.addr()) == 0, "XAVOPrinterNetNptabEnum");
        },
        [] {
            ORLICSzList *list = nullptr;
            Must(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_USB | XAVO_PRINTER_TYPE_NET, &list) >= 1, "XAVOPrinterEnumCount");
            ORLICSzListFree(list);
        },
        [&r] { Must(XAVOPrinterNetUpdateConf(0, &r.net) == 0, "XAVOPrinterNetUpdateConf remove"); },
        [&r] { Must(XAVOPrinterGoogleInfoSet(&r.google) == 0, "XAVOPrinterGoogleInfoSet"); },
        [] {
            PrinterGoogleInfo info{};
            Must(XAVOPrinterGoogleInfoGet(&info) == 0, "XAVOPrinterGoogleInfoGet");
        },
        [] {
            char id[] = "MFG:ACME;MDL:Model 100;CMD:ESCPL2,PCL;";
            char buf[64];
            Must(XAVOPrinterConfStringIdParse(id, "MDL", buf, sizeof buf) == 0, "XAVOPrinterConfStringIdParse");
        },
        [] {
            char **names = nullptr;
            int32_t n = 0;
            Must(XAVOPrinterUsbtabEnum(&names, &n) == 0, "XAVOPrinterUsbtabEnum");
            std::free(names);
        },
    };
}

int Run(const xavo::bench::Options &o) {
    xavo::test::PlaceFile("/usr/xavo/etc/printer.conf",
                          std::string("[") + kPrinterId + "]\n\tcups printer name = usbprinter1\n");
    xavo::test::PlaceFile("/usr/xavo/etc/nptab", "10.0.0.5=\"office\"\n");
    xavo::test::PlaceFile("/tmp/usbtab", "lp0=\"1-1\"\n");
    xavo::test::PlugUsbDevice({});  // lp0 on 1-1
    Records r;
    std::snprintf(r.usb.szPrinterId, sizeof r.usb.szPrinterId, "%s", kPrinterId);
    std::snprintf(r.usb.szProducer, sizeof r.usb.szProducer, "ACME");
    std::snprintf(r.net.szPrinterId, sizeof r.net.szPrinterId, "10.0.0.9-lab");
    std::snprintf(r.net.szIP, sizeof r.net.szIP, "10.0.0.9");
    std::snprintf(r.net.szCupsPrinterName, sizeof r.net.szCupsPrinterName, "lab");
    std::snprintf(r.net.szBackend, sizeof r.net.szBackend, "socket");
    std::snprintf(r.google.szAccount, sizeof r.google.szAccount, "someone@example.com");
    std::snprintf(r.google.szPassword, sizeof r.google.szPassword, "secret");
    const std::vector<std::function<void()>> calls = Calls(r);
    const int total = o.bSmoke ? 2000 : 10000;
    auto run = [&](int n) {
        for (int i = 0; i < n; ++i) calls[static_cast<size_t>(i) % calls.size()]();
        // Nothing should be logged; what is would grow the capture's memory.
        Must(xavo::test::TakeLogs().empty(), "calls without log lines");
    };
    run(1000);
    // The measuring itself (stdio buffers, a directory stream) allocates:
    // done once before, so that it weighs on both readings alike.
    ResidentKiB();
    OpenDescriptors();
    std::printf("  %d calls after %d:\n", o.bSmoke ? 2000 : 10000, 1000);
    const long rssBefore = ResidentKiB(), fdsBefore = OpenDescriptors();
    const double start = xavo::bench::NowMs();
    run(total);
    const long rssAfter = ResidentKiB(), fdsAfter = OpenDescriptors();
    std::printf("  %.0f ms: resident %ld -> %ld KiB, descriptors %ld -> %ld\n",
                xavo::bench::NowMs() - start, rssBefore, rssAfter, fdsBefore, fdsAfter);
    xavo::bench::Verdicts v;
    v.Report("resident set growth over " + std::to_string(total) + " mixed calls, KiB",
             static_cast<double>(rssAfter - rssBefore), 64);
    v.Report("open descriptors gained over " + std::to_string(total) + " mixed calls",
             static_cast<double>(fdsAfter - fdsBefore), 0);
    return v.ExitCode();
}

}  // namespace

int main(int argc, char **argv) {
    const xavo::bench::Options o = xavo::bench::ParseOptions(argc, argv, 1);
    return xavo::bench::Main([&] { return Run(o); });
}
