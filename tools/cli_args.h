// Command line of the xavoprinter command: a subcommand path ("usb enable"),
// positional arguments and --options, checked against the subcommand's own
// description so that every usage error is caught before anything runs.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace cli {

struct OptionSpec {
    std::string name;  // "--title"
    bool bTakesValue;
    std::string help;
};

struct Args {
    std::vector<std::string> positional;
    std::map<std::string, std::string> options;  // "--title" -> "T"; flags -> ""
    bool json = false;
    bool help = false;

    bool Has(const std::string &name) const { return options.count(name) != 0; }
    std::optional<std::string> Get(const std::string &name) const {
        auto it = options.find(name);
        if (it == options.end()) return std::nullopt;
        return it->second;
    }
};

// Parses argv (after the subcommand words) against the allowed options.
// Returns an error text for a usage error, or nullopt.  "--json" and
// "--help" are accepted everywhere.
std::optional<std::string> ParseArgs(const std::vector<std::string> &words, const std::vector<OptionSpec> &allowed,
                                     Args &out);

}  // namespace cli
