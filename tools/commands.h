// The subcommands of xavoprinter, one file per group.  Each group adds its
// subcommands to the CLI11 application; the one the command line selects
// leaves its action in the registry, and main() runs it once parsing has
// succeeded, so that no usage error is found after something has run.
#pragma once

#include <functional>
#include <string>

#include <CLI/CLI.hpp>

namespace cli {

// The arguments many subcommands take, each with its name, help and check.
enum class Arg { kPrinterId, kIp, kDevice, kQueueName };
// Adds `arg` to `sub` as a required argument read into `value`.
CLI::Option *AddArg(CLI::App *sub, Arg arg, std::string &value);
constexpr char kDeviceHelp[] = "usblp device name (lp0, lp1) or device path";

struct Registry {
    bool bJson = false;
    bool bVerbose = false;
    std::function<int()> action;

    // Makes `sub` a runnable subcommand: its --json and -v flags, its
    // example in the help, and the action to run when it is chosen.
    // `check`, when given, returns what is wrong with the arguments as a
    // whole ("" when nothing), a usage error found while parsing.
    void On(CLI::App *sub, const std::string &example, std::function<int()> run,
            std::function<std::string()> check = {});
    // A subcommand of `group` whose one argument is `arg`, made runnable
    // as by On.
    void Leaf(CLI::App *group, const std::string &name, const std::string &description, Arg arg,
              std::string &value, const std::string &example, std::function<int()> run);
};

void AddPrinterCommands(CLI::App &app, Registry &reg);  // list, show
void AddUsbCommands(CLI::App &app, Registry &reg);
void AddNetCommands(CLI::App &app, Registry &reg);
void AddNetAddCommand(CLI::App &net, Registry &reg);
void AddQueueCommands(CLI::App &app, Registry &reg);
void AddPrintCommands(CLI::App &app, Registry &reg);  // print, job, spool
void AddShareCommands(CLI::App &app, Registry &reg);  // share, cloud, usbip

// The CUPS queue name kept in a printer's section, "" when none.
std::string CupsNameOf(const std::string &printerId);
// A line on standard error while a long wait goes on, on a terminal only.
void Progress(const std::string &text);

}  // namespace cli
