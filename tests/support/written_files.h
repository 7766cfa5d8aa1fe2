// The files the library writes, read the way their readers read them (the
// rules of Samba's parser, which the appliance's platform follows), and
// checked against what the library was asked to write: every other
// section, key or line was injected by the text that went in.
#pragma once

#include <filesystem>
#include <map>
#include <set>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "sandbox/sandbox.h"
#include "support/paths.h"

namespace xavo::test {

using Keys = std::set<std::string>;

inline const Keys kUsbSectionKeys = {"producer", "product name", "mode", "autolock timer", "manuallock timer",
                                     "enable airprint", "enable google cloud print", "driver", "driver brand",
                                     "usblp string id", "fit to page", "cups printer name"};
inline const Keys kNetSectionKeys = {"IP", "cups printer name", "Backend", "QName", "Brand", "Model",
                                     "enable airprint", "enable google cloud print", "driver brand", "driver",
                                     "string id", "fit to page"};
inline const Keys kCloudSectionKeys = {"google account", "google pass", "refresh token"};
inline const Keys kSmbShareKeys = {"comment", "path", "browseable", "public", "guest ok", "writable", "printable"};

// What one call sequence may have written: sections of the printer
// configuration file with their keys, and the keys of the two tables.  The
// Samba share file may always hold its "printers" share.
struct Expected {
    std::map<std::string, const Keys *> sections;
    Keys nptabKeys, usbtabKeys;

    static Expected Usb(const std::string &id) { return Expected{{{id, &kUsbSectionKeys}}, {}, {"lp0"}}; }
    static Expected Net(const std::string &id, const std::string &ip) {
        return Expected{{{id, &kNetSectionKeys}}, {ip}, {}};
    }
};

inline std::string_view TrimBlanks(std::string_view s) {
    const size_t first = s.find_first_not_of(" \t");
    if (first == std::string_view::npos) return {};
    return s.substr(first, s.find_last_not_of(" \t") - first + 1);
}

// Every line of a file checked the way its reader reads it: lines before
// any header hold keys of topKeys (a table is nothing but such lines), and a
// header opens one of the sections when the file has sections at all.  A
// line that is neither blank, nor a header, nor "key = value" is one the
// writers never make; nor is a comment or a carriage return (a reader that
// splits lines there would see a line of its own).
inline void CheckFile(const char *szFile, const Keys &topKeys, const std::map<std::string, const Keys *> &sections,
                      std::vector<std::string> *pFound) {
    std::set<std::string> names, keys;
    const Keys *pKeys = &topKeys;
    const std::string file = szFile;
    std::istringstream text(ReadFile(szFile));
    for (std::string raw; std::getline(text, raw);) {
        const std::string_view line = TrimBlanks(raw);
        if (line.find('\r') != std::string_view::npos) pFound->push_back(file + ": carriage return");
        if (!line.empty() && (line[0] == '#' || line[0] == ';')) pFound->push_back(file + ": comment");
        if (line.empty() || line[0] == '#' || line[0] == ';') continue;
        const bool bHeaderLike = !sections.empty() && line[0] == '[';
        const size_t close = line.rfind(']');
        if (bHeaderLike && close != std::string_view::npos && close > 0) {
            const std::string name(line.substr(1, close - 1));
            auto it = sections.find(name);
            if (it == sections.end() || !names.insert(name).second) pFound->push_back(file + ": section " + name);
            pKeys = it == sections.end() ? nullptr : it->second;
            keys.clear();
            continue;
        }
        const size_t eq = line.find('=');
        const std::string key(TrimBlanks(line.substr(0, eq)));
        if (bHeaderLike || eq == std::string_view::npos) {
            pFound->push_back(file + ": line " + std::string(line.substr(0, 60)));
        } else if (pKeys == nullptr || pKeys->count(key) == 0 || !keys.insert(key).second) {
            pFound->push_back(file + ": key " + key.substr(0, 60));
        }
    }
}

// The USB/IP status files belong to the sharing service: the library never
// writes one.
inline std::vector<std::string> UsbipFiles() {
    std::vector<std::string> files;
    for (const auto &entry : std::filesystem::directory_iterator("/tmp")) {
        const std::string name = entry.path().filename().string();
        if (name.starts_with("usbip_")) files.push_back(entry.path().string());
    }
    return files;
}

inline std::vector<std::string> Injections(const Expected &expected) {
    std::vector<std::string> found;
    CheckFile(kConf, {}, expected.sections, &found);
    CheckFile(kSmbConf, {}, {{"printers", &kSmbShareKeys}}, &found);
    CheckFile(kNptab, expected.nptabKeys, {}, &found);
    CheckFile(kUsbtab, expected.usbtabKeys, {}, &found);
    for (const std::string &path : UsbipFiles()) found.push_back(path + ": written");
    return found;
}

inline void ClearWrittenFiles() {
    for (const char *szFile : {kConf, kNptab, kUsbtab, kSmbConf}) std::filesystem::remove(szFile);
    for (const std::string &path : UsbipFiles()) std::filesystem::remove(path);
}

}  // namespace xavo::test
