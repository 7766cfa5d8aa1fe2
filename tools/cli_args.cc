#include "cli_args.h"

namespace cli {

std::optional<std::string> ParseArgs(const std::vector<std::string> &words, const std::vector<OptionSpec> &allowed,
                                     Args &out) {
    for (size_t i = 0; i < words.size(); ++i) {
        const std::string &w = words[i];
        if (w == "--json") {
            out.json = true;
        } else if (w == "--help" || w == "-h") {
            out.help = true;
        } else if (w == "--") {
            out.positional.insert(out.positional.end(), words.begin() + static_cast<long>(i) + 1, words.end());
            break;
        } else if (w.rfind("--", 0) == 0) {
            std::string name = w;
            std::optional<std::string> inlineValue;
            if (size_t eq = w.find('='); eq != std::string::npos) {
                name = w.substr(0, eq);
                inlineValue = w.substr(eq + 1);
            }
            const OptionSpec *known = nullptr;
            for (const OptionSpec &o : allowed) {
                if (o.name == name) known = &o;
            }
            if (known == nullptr) return "unknown option " + name;
            if (!known->bTakesValue) {
                if (inlineValue) return name + " takes no value";
                out.options[name] = "";
            } else if (inlineValue) {
                out.options[name] = *inlineValue;
            } else if (i + 1 < words.size()) {
                out.options[name] = words[++i];
            } else {
                return name + " needs a value";
            }
        } else {
            out.positional.push_back(w);
        }
    }
    return std::nullopt;
}

}  // namespace cli
