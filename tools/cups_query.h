// What CUPS itself says, asked through its command-line clients, so that
// the command can tell what a library call actually did: whether a queue
// exists and is enabled, which jobs are still listed.  The library gives
// no way to ask this; its own listings answer other questions.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace cli {

// ---- pure readers of one line ----

// "printer office is idle.  enabled since ..." / "printer office disabled
// since ...": the queue's name and whether it accepts printing.
struct QueueLine {
    std::string name;
    bool bEnabled;
};
std::optional<QueueLine> ParseLpstatPrinterLine(std::string_view line);

// A job line of lpq's listing: "active  root  12  letter  1024 bytes".
// Header lines ("office is ready", "Rank Owner Job ...") give nothing.
struct JobLine {
    int job;            // CUPS job number
    std::string title;  // as lpq shows it (cut to its column)
};
std::optional<JobLine> ParseLpqJobLine(std::string_view line);

// ---- asking CUPS ----

enum class QueueState { kEnabled, kDisabled, kMissing };
const char *QueueStateName(QueueState state);

// Every queue CUPS knows, from "lpstat -r -p"; nullopt when the scheduler
// cannot be asked (not running, lpstat missing).
struct Queues {
    std::vector<QueueLine> lines;
    QueueState StateOf(const std::string &name) const;
};
std::optional<Queues> AskQueues(bool bVerbose);
// The state of one queue; nullopt when the scheduler cannot be asked.
std::optional<QueueState> AskQueueState(const std::string &name, bool bVerbose);

// The jobs lpq lists for a queue, or for every queue when name is empty
// ("lpq -a"); nullopt when lpq could not be run.
std::optional<std::vector<JobLine>> AskJobs(const std::string &queue, bool bVerbose);

}  // namespace cli
