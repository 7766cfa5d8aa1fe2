#include "report.h"

#include <cstdio>
#include <stdexcept>

#include "xavoprinter.h"

namespace cli {
namespace {

struct CodeName {
    std::uint32_t code;
    const char *name;
};
constexpr CodeName kCodeNames[] = {
    {ERR_BUF_TOO_SMALL, "ERR_BUF_TOO_SMALL"},   {ERR_OUT_OF_MEMORY, "ERR_OUT_OF_MEMORY"},
    {ERR_LOCK, "ERR_LOCK"},                     {ERR_UNLOCK, "ERR_UNLOCK"},
    {ERR_OPEN, "ERR_OPEN"},                     {ERR_READ, "ERR_READ"},
    {ERR_WRITE, "ERR_WRITE"},                   {ERR_BAD_PARAMETERS, "ERR_BAD_PARAMETERS"},
    {ERR_KEY_NOT_FOUND, "ERR_KEY_NOT_FOUND"},   {ERR_NOT_FOUND, "ERR_NOT_FOUND"},
    {ERR_RENAME, "ERR_RENAME"},                 {ERR_EXEC, "ERR_EXEC"},
    {ERR_REMOVE_KEY, "ERR_REMOVE_KEY"},         {ERR_BAD_DATA, "ERR_BAD_DATA"},
    {ERR_SERVICE_RUNNING, "ERR_SERVICE_RUNNING"},
};

// Length of the UTF-8 sequence starting at text[at], 0 when the bytes
// there are not one.  Overlong forms and surrogates count as invalid.
size_t Utf8Length(std::string_view text, size_t at) {
    const auto byte = [&](size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned char lead = byte(at);
    size_t n = lead < 0x80 ? 1 : lead >= 0xC2 && lead <= 0xDF ? 2 : lead >= 0xE0 && lead <= 0xEF ? 3
                                 : lead >= 0xF0 && lead <= 0xF4                               ? 4
                                                                                              : 0;
    if (n == 0 || at + n > text.size()) return 0;
    for (size_t i = 1; i < n; ++i) {
        if ((byte(at + i) & 0xC0) != 0x80) return 0;
    }
    if (n == 3 && lead == 0xE0 && byte(at + 1) < 0xA0) return 0;
    if (n == 3 && lead == 0xED && byte(at + 1) >= 0xA0) return 0;
    if (n == 4 && lead == 0xF0 && byte(at + 1) < 0x90) return 0;
    if (n == 4 && lead == 0xF4 && byte(at + 1) >= 0x90) return 0;
    return n;
}

std::string Hex(unsigned char c) {
    char sz[8];
    std::snprintf(sz, sizeof sz, "\\x%02X", c);
    return sz;
}

// One value as text-mode output shows it.
std::string TextOf(const Json &value) {
    if (value.is_null()) return "(none)";
    if (value.is_boolean()) return value.get<bool>() ? "yes" : "no";
    if (value.is_string()) return SafeText(value.get<std::string>());
    if (value.is_object()) {
        std::string line;
        for (const auto &[key, item] : value.items()) line += (line.empty() ? "" : "  ") + key + "=" + TextOf(item);
        return line;
    }
    if (value.is_array()) {
        std::string line;
        for (const Json &item : value) line += (line.empty() ? "" : ", ") + TextOf(item);
        return line;
    }
    return value.dump();
}

}  // namespace

std::string ErrorName(std::uint32_t uCode) {
    for (const CodeName &n : kCodeNames) {
        if (n.code == uCode) return n.name;
    }
    return "";
}

std::string ErrorCodeText(std::uint32_t uCode) {
    char sz[16];
    std::snprintf(sz, sizeof sz, "0x%04X", uCode);
    const std::string name = ErrorName(uCode);
    return name.empty() ? sz : std::string(sz) + " " + name;
}

void ResetPlatformError() { ORLICErrSetEx(0, "", 0); }

std::string SafeText(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (size_t at = 0; at < text.size();) {
        const unsigned char c = static_cast<unsigned char>(text[at]);
        const size_t n = Utf8Length(text, at);
        // C1 controls are two-byte sequences U+0080..U+009F: a terminal
        // may act on them like on ESC sequences.
        const bool bC1 = n == 2 && c == 0xC2 && static_cast<unsigned char>(text[at + 1]) < 0xA0;
        if (n == 0 || c < 0x20 || c == 0x7F || bC1) {
            for (size_t i = 0; i < (n == 0 ? 1 : n); ++i) out += Hex(static_cast<unsigned char>(text[at + i]));
            at += n == 0 ? 1 : n;
        } else if (c == '\\') {
            out += "\\\\";
            ++at;
        } else {
            out.append(text.substr(at, n));
            at += n;
        }
    }
    return out;
}

std::string Dump(const Json &value) { return value.dump(-1, ' ', false, Json::error_handler_t::replace); }

Report::Report(bool bJson, std::initializer_list<const char *> keys) : json_(bJson), fields_(Json::object()) {
    for (const char *key : keys) fields_[key] = nullptr;
}

void Report::Set(const std::string &key, Json value) {
    if (!fields_.contains(key)) throw std::logic_error("undeclared output key " + key);
    fields_[key] = std::move(value);
}

void Report::SetTable(const std::string &key, Json rows) {
    Set(key, std::move(rows));
    tables_.push_back(key);
}

void Report::Note(const std::string &line) { notes_.push_back(line); }

int Report::Succeed() { return Finish(true, nullptr); }

int Report::Fail(const std::string &sentence) { return Fail(sentence, ORLICErrGet()); }

int Report::Fail(const std::string &sentence, std::uint32_t uCode) {
    if (uCode == 0) return FailWithoutCode(sentence);
    const std::string name = ErrorName(uCode);
    return Finish(false, Json{{"code", uCode}, {"name", name.empty() ? Json(nullptr) : Json(name)},
                              {"message", sentence}});
}

int Report::FailWithoutCode(const std::string &sentence) {
    return Finish(false, Json{{"code", nullptr}, {"name", nullptr}, {"message", sentence}});
}

int Report::Finish(bool bOk, const Json &error) {
    if (json_) {
        Json out = Json::object();
        out["ok"] = bOk;
        for (const auto &[key, value] : fields_.items()) out[key] = value;
        out["notes"] = notes_;
        out["error"] = error;
        std::printf("%s\n", Dump(out).c_str());
        return bOk ? 0 : 1;
    }
    for (const auto &[key, value] : fields_.items()) {
        if (std::find(tables_.begin(), tables_.end(), key) != tables_.end()) {
            for (const Json &row : value) std::printf("%s\n", TextOf(row).c_str());
            if (value.empty()) std::printf("(no %s)\n", key.c_str());
        } else if (value.is_array() && value.empty()) {
            // Nothing replaced, nothing undone: nothing to say.
        } else if (bOk || !value.is_null()) {
            std::printf("%s: %s\n", key.c_str(), TextOf(value).c_str());
        }
    }
    std::FILE *noteStream = bOk ? stdout : stderr;
    for (const std::string &line : notes_) std::fprintf(noteStream, "%s\n", SafeText(line).c_str());
    if (!bOk) {
        std::string line = "xavoprinter: " + SafeText(error["message"].get<std::string>());
        if (!error["code"].is_null()) line += " (" + ErrorCodeText(error["code"].get<std::uint32_t>()) + ")";
        std::fprintf(stderr, "%s\n", line.c_str());
    }
    return bOk ? 0 : 1;
}

}  // namespace cli
