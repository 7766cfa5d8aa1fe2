// What every benchmark shares: entering the sandbox, timing interleaved
// rounds, summing them up and printing the verdict.
//
// A benchmark measures the library and its floor (the least work that does
// the same job) side by side in one run: every round runs each candidate
// once, in an order that turns with the round, so that a machine that gets
// busier or quieter meanwhile weighs on all of them alike.  Figures are
// medians over the rounds, shown with their min-max.
//
// Each figure ends in one line "NAME: ratio R (goal G)"; R is the figure in
// the unit of its goal (a ratio of times, a growth exponent, KiB).  The
// program exits 0 when every goal holds, 1 when one does not, 2 when it
// could not measure.  With --smoke it runs a couple of rounds only, so
// that the test command keeps the benchmarks working; its figures mean
// nothing then.
#pragma once

#include <sys/resource.h>
#include <sys/types.h>
#include <time.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <exception>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include "sandbox/sandbox.h"
#include "sandbox/sandbox_internal.h"

namespace xavo::bench {

// Stops the benchmark (exit 2) when a call it times does not do its job.
inline void Must(bool bOk, const std::string &what) {
    if (!bOk) throw std::runtime_error(what + " failed");
}

struct Options {
    bool bSmoke = false;
    int rounds = 0;
};

inline Options ParseOptions(int argc, char **argv, int fullRounds) {
    Options o;
    o.rounds = fullRounds;
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--smoke") == 0) {
            o.bSmoke = true;
            o.rounds = 2;
        }
    }
    return o;
}

// What a sample measures.  On a machine shared with other work, waiting for
// a CPU would swamp what is measured, so work is timed by the CPU time it
// takes wherever that can be summed up: kThreadCpu, the calling thread's
// (user and system); kCpuWithPeers, that plus the programs it started and
// waited for plus the peer daemon (cupsd) whose id SetPeer() gave.  kWall is
// the wall clock.  kReported takes the time the run itself reported with
// ReportSample(), for work measured in another process.
enum class Clock { kThreadCpu, kCpuWithPeers, kWall, kReported };

inline double &ReportedSample() {
    static double ms = 0;
    return ms;
}
inline void ReportSample(double ms) { ReportedSample() = ms; }

// The CPU time of this process's calling thread and of the children it has
// waited for, in ms.
inline double OwnAndChildrenCpuMs() {
    timespec ts{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
    double ms = static_cast<double>(ts.tv_sec) * 1e3 + static_cast<double>(ts.tv_nsec) / 1e6;
    rusage ru{};
    getrusage(RUSAGE_CHILDREN, &ru);
    for (const timeval &tv : {ru.ru_utime, ru.ru_stime}) {
        ms += static_cast<double>(tv.tv_sec) * 1e3 + static_cast<double>(tv.tv_usec) / 1e3;
    }
    return ms;
}

inline pid_t &Peer() {
    static pid_t peer = 0;
    return peer;
}
inline void SetPeer(pid_t pid) { Peer() = pid; }

// CPU time of a process in ms from /proc/PID/schedstat (nanoseconds, unlike
// the clock ticks of /proc/PID/stat); 0 when it cannot be read.
inline double ProcessCpuMs(pid_t pid) {
    std::string path = "/proc/" + std::to_string(pid) + "/schedstat";
    FILE *f = std::fopen(path.c_str(), "r");
    if (f == nullptr) return 0;
    unsigned long long ns = 0;
    if (std::fscanf(f, "%llu", &ns) != 1) ns = 0;
    std::fclose(f);
    return static_cast<double>(ns) / 1e6;
}

inline double NowMs(Clock clock = Clock::kWall) {
    if (clock == Clock::kCpuWithPeers) return OwnAndChildrenCpuMs() + (Peer() > 0 ? ProcessCpuMs(Peer()) : 0);
    timespec ts{};
    clock_gettime(clock == Clock::kWall ? CLOCK_MONOTONIC : CLOCK_THREAD_CPUTIME_ID, &ts);
    return static_cast<double>(ts.tv_sec) * 1e3 + static_cast<double>(ts.tv_nsec) / 1e6;
}

struct Stats {
    double median = 0, min = 0, max = 0;
};

inline Stats Summarise(std::vector<double> samples) {
    Stats s;
    if (samples.empty()) return s;
    std::sort(samples.begin(), samples.end());
    size_t n = samples.size();
    s.median = n % 2 == 1 ? samples[n / 2] : (samples[n / 2 - 1] + samples[n / 2]) / 2;
    s.min = samples.front();
    s.max = samples.back();
    return s;
}

// A thing to time: its name in the detail lines, and one run of it (which
// may repeat the work inside; the time of the whole run is the sample).
struct Candidate {
    std::string name;
    std::function<void()> run;
    std::function<void()> prepare = [] {};  // before each run, not timed
};

// The samples of every candidate (in ms), rounds interleaved; a first
// untimed round warms caches and the page cache.
inline std::vector<Stats> Interleaved(const Options &o, Clock clock, const std::vector<Candidate> &candidates) {
    std::vector<std::vector<double>> samples(candidates.size());
    for (const Candidate &c : candidates) {
        c.prepare();
        c.run();
    }
    for (int round = 0; round < o.rounds; ++round) {
        for (size_t k = 0; k < candidates.size(); ++k) {
            size_t i = (k + static_cast<size_t>(round)) % candidates.size();
            candidates[i].prepare();
            ReportSample(0);
            double start = NowMs(clock);
            candidates[i].run();
            samples[i].push_back(clock == Clock::kReported ? ReportedSample() : NowMs(clock) - start);
        }
    }
    std::vector<Stats> stats;
    for (size_t i = 0; i < candidates.size(); ++i) {
        stats.push_back(Summarise(samples[i]));
        std::printf("    %-58s %9.3f ms  (%.3f-%.3f)\n", candidates[i].name.c_str(), stats[i].median, stats[i].min,
                    stats[i].max);
    }
    return stats;
}

// Slope of log(time) over log(size), least squares: 1 is linear, 2
// quadratic.
inline double GrowthExponent(const std::vector<double> &sizes, const std::vector<double> &times) {
    double n = static_cast<double>(sizes.size()), sx = 0, sy = 0, sxx = 0, sxy = 0;
    for (size_t i = 0; i < sizes.size(); ++i) {
        double x = std::log(sizes[i]), y = std::log(std::max(times[i], 1e-9));
        sx += x;
        sy += y;
        sxx += x * x;
        sxy += x * y;
    }
    return (n * sxy - sx * sy) / (n * sxx - sx * sx);
}

// The verdicts of one benchmark program.
class Verdicts {
public:
    // Prints "NAME: ratio R (goal G)"; the goal holds when R <= G.
    void Report(const std::string &name, double value, double goal) {
        std::printf("%s: ratio %.2f (goal %.2f)\n", name.c_str(), value, goal);
        std::fflush(stdout);
        if (!(value <= goal)) bMissed_ = true;
    }
    int ExitCode() const { return bMissed_ ? 1 : 0; }

private:
    bool bMissed_ = false;
};

// main() of a benchmark: enters the sandbox while the process has one
// thread, runs body, stops whatever body left running by its id.
inline int Main(const std::function<int()> &body) {
    xavo::test::EnterSandbox();
    int status = 2;
    try {
        status = body();
    } catch (const std::exception &e) {
        std::fprintf(stderr, "benchmark failed: %s\n", e.what());
    }
    xavo::test::detail::StopLeftovers();
    return status;
}

}  // namespace xavo::bench
