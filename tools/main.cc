// xavoprinter: the appliance's printers from the command line.
//
// Every subcommand calls the library's public operations the way an
// appliance service does and prints what actually happened.  Exit status:
// 0 success, 1 the operation failed or did nothing, 2 usage error (found
// before anything ran).  Secrets are read from standard input or a prompt,
// never from the command line, where other users could read them.
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <exception>
#include <string>

#include "checks.h"
#include "commands.h"
#include "xavoprinter.h"

namespace cli {

void Registry::On(CLI::App *sub, const std::string &example, std::function<int()> run,
                  std::function<std::string()> check) {
    sub->add_flag("--json", bJson, "print one JSON object (same keys on every run)");
    sub->add_flag("-v,--verbose", bVerbose, "copy the library's syslog lines to standard error");
    sub->footer("Example:\n  " + example);
    sub->callback([this, sub, run = std::move(run), check = std::move(check)] {
        // A subcommand's callback runs after its own subcommand's ("print"
        // after "print test-page"): the deepest one chosen decides.
        if (!sub->get_subcommands().empty()) return;
        if (check) {
            if (const std::string why = check(); !why.empty()) throw CLI::ValidationError(sub->get_name(), why);
        }
        action = run;
    });
}

void Registry::Leaf(CLI::App *group, const std::string &name, const std::string &description, Arg arg,
                    std::string &value, const std::string &example, std::function<int()> run) {
    CLI::App *sub = group->add_subcommand(name, description);
    AddArg(sub, arg, value);
    On(sub, example, std::move(run));
}

CLI::Option *AddArg(CLI::App *sub, Arg arg, std::string &value) {
    switch (arg) {
        case Arg::kPrinterId: return sub->add_option("ID", value, "printer ID")->required()->check(Text(kMaxPrinterId));
        case Arg::kIp: return sub->add_option("IP", value, "the printer's IPv4 address")->required()->check(IPv4());
        case Arg::kDevice: return sub->add_option("DEV", value, kDeviceHelp)->required()->check(Text(kMaxField));
        case Arg::kQueueName:
            return sub->add_option("NAME", value, "CUPS queue name")->required()->check(CupsQueueName());
    }
    return nullptr;
}

std::string CupsNameOf(const std::string &printerId) {
    char szName[128] = {};
    if (XAVOPrinterCupsNameGet(printerId.c_str(), szName, sizeof szName) != 0) return "";
    return szName;
}

void Progress(const std::string &text) {
    if (isatty(STDERR_FILENO) == 1) std::fprintf(stderr, "%s\n", text.c_str());
}

}  // namespace cli

namespace {

constexpr int kExitUsage = 2;

// Options that would put a secret on the command line, where any user can
// read it in the process list: refused with a pointer to standard input
// rather than the parser's plain "not expected".
bool NamesASecret(const std::string &word) {
    for (const char *bad : {"--password", "--pass", "--secret", "--refresh-token"}) {
        if (word == bad || word.starts_with(std::string(bad) + "=")) return true;
    }
    return false;
}

// A group (usb, net...) given without one of its subcommands: its help,
// which lists them, as the usage error.
int GroupUsage(const CLI::App &app) {
    const CLI::App *at = &app;
    std::string path;
    for (;;) {
        const std::vector<CLI::App *> chosen = at->get_subcommands();
        if (chosen.empty()) break;
        path += (path.empty() ? "" : " ") + at->get_name();
        at = chosen.front();
    }
    std::fprintf(stderr, "%s", at->help(path).c_str());
    if (at != &app) std::fprintf(stderr, "xavoprinter: '%s' needs one of the subcommands above\n", at->get_name().c_str());
    return kExitUsage;
}

}  // namespace

int main(int argc, char **argv) {
    CLI::App app{"The appliance's printers: USB and network printers, their CUPS queues, jobs and sharing.\n"
                 "Exit status: 0 success, 1 the operation failed or did nothing, 2 usage error.",
                 "xavoprinter"};
    app.set_version_flag("--version", "xavoprinter " XAVO_VERSION);
    app.footer("'xavoprinter COMMAND --help' lists a group's subcommands or shows a subcommand's options and example.");
    cli::Registry reg;
    cli::AddPrinterCommands(app, reg);
    cli::AddUsbCommands(app, reg);
    cli::AddNetCommands(app, reg);
    cli::AddQueueCommands(app, reg);
    cli::AddPrintCommands(app, reg);
    cli::AddShareCommands(app, reg);
    for (int i = 1; i < argc; ++i) {
        if (NamesASecret(argv[i])) {
            std::fprintf(stderr, "xavoprinter: secrets are never taken from the command line; give them on standard input\n");
            return kExitUsage;
        }
    }
    try {
        app.parse(argc, argv);
    } catch (const CLI::CallForHelp &e) {
        return app.exit(e);
    } catch (const CLI::CallForAllHelp &e) {
        return app.exit(e);
    } catch (const CLI::CallForVersion &e) {
        return app.exit(e);
    } catch (const CLI::ParseError &e) {
        std::fprintf(stderr, "xavoprinter: %s\nRun with --help for more information.\n", e.what());
        return kExitUsage;
    }
    if (!reg.action) return GroupUsage(app);
    // The library logs through syslog only; -v shows those lines as well,
    // so that an operator sees why a call failed.
    if (reg.bVerbose) openlog("xavoprinter", LOG_PERROR | LOG_PID, LOG_USER);
    try {
        return reg.action();
    } catch (const std::exception &e) {
        std::fprintf(stderr, "xavoprinter: internal error: %s\n", e.what());
        return 1;
    }
}
