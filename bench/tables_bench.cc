// The tables at growing sizes: XAVOPrinterNetNptabEnum and
// XAVOPrinterEnumCount over the network printer table, XAVOPrinterUsbtabEnum
// over the USB printer table, and the removal of the table's last entry by
// XAVOPrinterNetUpdateConf (which reads the whole table into a string
// hash).  Each is timed at n, 4n and 16n lines (the calling thread's CPU
// time); the figure is the growth exponent, goal 1.15 (linear is 1).  A
// plain read of the table is shown beside them.
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "bench/bench.h"
#include "internal/guards.h"
#include "xavoprinter.h"

namespace {

using xavo::bench::Candidate;
using xavo::bench::Must;

constexpr char kNptab[] = "/usr/xavo/etc/nptab";
constexpr char kUsbtab[] = "/tmp/usbtab";

std::string Ip(int i) { return "10." + std::to_string(i / 62500) + "." + std::to_string(i / 250 % 250) + "." + std::to_string(i % 250 + 1); }

std::string NptabText(int n) {
    std::string text;
    for (int i = 0; i < n; ++i) text += Ip(i) + "=\"net" + std::to_string(i) + "\"\n";
    return text;
}

std::string UsbtabText(int n) {
    std::string text;
    for (int i = 0; i < n; ++i) text += "lp" + std::to_string(i) + "=\"1-" + std::to_string(i) + "\"\n";
    return text;
}

void PlainRead(const char *path) {
    int fd = open(path, O_RDONLY | O_CLOEXEC);
    Must(fd >= 0, "open the table");
    char buf[65536];
    while (read(fd, buf, sizeof buf) > 0) {
    }
    close(fd);
}

// Per-call milliseconds of each candidate at each size.  The sizes take
// their turns within every round like the candidates do, each sample with
// its own size's table placed first (untimed): measured one size after the
// other, a few seconds of a busier machine during the largest size alone
// bent the growth exponent by a tenth or more from one run to the next.
using Series = std::vector<std::vector<double>>;  // [size][candidate]

Series Measure(const xavo::bench::Options &o, const std::vector<int> &sizes,
               const std::function<std::vector<Candidate>(int n)> &candidatesAt) {
    std::vector<Candidate> all;
    size_t perSize = 0;
    for (int n : sizes) {
        std::vector<Candidate> at = candidatesAt(n);
        perSize = at.size();
        for (Candidate &c : at) {
            c.name = std::to_string(n) + " lines: " + c.name;
            all.push_back(std::move(c));
        }
    }
    const std::vector<xavo::bench::Stats> stats = xavo::bench::Interleaved(o, xavo::bench::Clock::kThreadCpu, all);
    Series series(sizes.size());
    for (size_t i = 0; i < stats.size(); ++i) series[i / perSize].push_back(stats[i].median);
    return series;
}

double Exponent(const std::vector<int> &sizes, const Series &series, size_t c) {
    std::vector<double> x, y;
    for (size_t i = 0; i < sizes.size(); ++i) {
        x.push_back(sizes[i]);
        y.push_back(series[i][c]);
    }
    return xavo::bench::GrowthExponent(x, y);
}

// Places path's text before each sample of a candidate of its size.
std::function<void()> Placing(const char *path, std::string text) {
    return [path, text = std::move(text)] { xavo::test::PlaceFile(path, text); };
}

std::vector<Candidate> NptabCandidates(int n) {
    const auto place = Placing(kNptab, NptabText(n));
    return {
        {"plain read of the table", [] { PlainRead(kNptab); }, place},
        {"XAVOPrinterNetNptabEnum",
         [] {
             xavo::SzList list(ORLICSzListAlloc(256));
             Must(XAVOPrinterNetNptabEnum(list.addr()) == 0, "XAVOPrinterNetNptabEnum");
         },
         place},
        {"XAVOPrinterEnumCount", [n] { Must(XAVOPrinterEnumCount(XAVO_PRINTER_TYPE_NET, nullptr) == n, "XAVOPrinterEnumCount"); },
         place},
    };
}

std::vector<Candidate> UsbtabCandidates(int n) {
    const auto place = Placing(kUsbtab, UsbtabText(n));
    return {
        {"plain read of the table", [] { PlainRead(kUsbtab); }, place},
        {"XAVOPrinterUsbtabEnum",
         [n] {
             char **names = nullptr;
             int32_t count = 0;
             Must(XAVOPrinterUsbtabEnum(&names, &count) == 0 && count == n, "XAVOPrinterUsbtabEnum");
             std::free(names);
         },
         place},
    };
}

std::vector<Candidate> RemovalCandidates(int n) {
    auto conf = std::make_shared<NetPrinterConf>();
    std::snprintf(conf->szIP, sizeof conf->szIP, "%s", Ip(n - 1).c_str());
    std::snprintf(conf->szCupsPrinterName, sizeof conf->szCupsPrinterName, "net%d", n - 1);
    const auto restore = Placing(kNptab, NptabText(n));
    return {
        {"plain read of the table", [] { PlainRead(kNptab); }, restore},
        {"XAVOPrinterNetUpdateConf removing the last line",
         [conf] { Must(XAVOPrinterNetUpdateConf(0, conf.get()) == 0, "XAVOPrinterNetUpdateConf"); }, restore},
    };
}

int Run(const xavo::bench::Options &o) {
    xavo::bench::Verdicts v;
    const std::vector<int> nptabSizes = {625, 2500, 10000};
    std::printf("network printer table\n");
    Series nptab = Measure(o, nptabSizes, NptabCandidates);
    v.Report("XAVOPrinterNetNptabEnum growth exponent over 625, 2500, 10000 lines", Exponent(nptabSizes, nptab, 1), 1.15);
    v.Report("XAVOPrinterEnumCount growth exponent over 625, 2500, 10000 lines", Exponent(nptabSizes, nptab, 2), 1.15);
    std::printf("USB printer table\n");
    const std::vector<int> usbtabSizes = {1000, 4000, 16000};
    Series usbtab = Measure(o, usbtabSizes, UsbtabCandidates);
    v.Report("XAVOPrinterUsbtabEnum growth exponent over 1000, 4000, 16000 lines", Exponent(usbtabSizes, usbtab, 1), 1.15);
    std::printf("network printer table, removal\n");
    const std::vector<int> removalSizes = {2000, 8000, 32000};
    Series removal = Measure(o, removalSizes, RemovalCandidates);
    v.Report("XAVOPrinterNetUpdateConf removal growth exponent over 2000, 8000, 32000 lines",
             Exponent(removalSizes, removal, 1), 1.15);
    return v.ExitCode();
}

}  // namespace

int main(int argc, char **argv) {
    const xavo::bench::Options o = xavo::bench::ParseOptions(argc, argv, 9);
    return xavo::bench::Main([&] { return Run(o); });
}
