#include "cli_output.h"

#include <cstdio>

#include "xavoprinter.h"

namespace cli {

std::string ErrorCodeText(std::uint32_t uCode) {
    struct Name {
        std::uint32_t code;
        const char *name;
    };
    static constexpr Name kNames[] = {
        {ERR_BUF_TOO_SMALL, "ERR_BUF_TOO_SMALL"}, {ERR_OUT_OF_MEMORY, "ERR_OUT_OF_MEMORY"},
        {ERR_LOCK, "ERR_LOCK"},                   {ERR_UNLOCK, "ERR_UNLOCK"},
        {ERR_OPEN, "ERR_OPEN"},                   {ERR_READ, "ERR_READ"},
        {ERR_WRITE, "ERR_WRITE"},                 {ERR_BAD_PARAMETERS, "ERR_BAD_PARAMETERS"},
        {ERR_KEY_NOT_FOUND, "ERR_KEY_NOT_FOUND"}, {ERR_NOT_FOUND, "ERR_NOT_FOUND"},
        {ERR_RENAME, "ERR_RENAME"},               {ERR_EXEC, "ERR_EXEC"},
        {ERR_REMOVE_KEY, "ERR_REMOVE_KEY"},       {ERR_BAD_DATA, "ERR_BAD_DATA"},
        {ERR_SERVICE_RUNNING, "ERR_SERVICE_RUNNING"},
    };
    char szCode[16];
    std::snprintf(szCode, sizeof szCode, "0x%04X", uCode);
    for (const Name &n : kNames) {
        if (n.code == uCode) return std::string(szCode) + " " + n.name;
    }
    return std::string(szCode) + (uCode == 0 ? " (none)" : " (platform)");
}

std::string JsonString(const std::string &s) {
    std::string out = "\"";
    for (unsigned char c : s) {
        switch (c) {
            case '"': out += "\\\""; break;
            case '\\': out += "\\\\"; break;
            case '\n': out += "\\n"; break;
            case '\r': out += "\\r"; break;
            case '\t': out += "\\t"; break;
            default:
                if (c < 0x20) {
                    char esc[8];
                    std::snprintf(esc, sizeof esc, "\\u%04x", c);
                    out += esc;
                } else {
                    out += static_cast<char>(c);
                }
        }
    }
    return out + "\"";
}

void Output::Field(const std::string &key, const std::string &value) {
    fields_.emplace_back(key, JsonString(value));
    text_.push_back(key + ": " + value);
}

void Output::Field(const std::string &key, long long value) {
    fields_.emplace_back(key, std::to_string(value));
    text_.push_back(key + ": " + std::to_string(value));
}

void Output::Field(const std::string &key, bool value) {
    fields_.emplace_back(key, value ? "true" : "false");
    text_.push_back(key + ": " + (value ? "yes" : "no"));
}

void Output::Rows(const std::string &key, const std::vector<Row> &rows) {
    std::string json = "[";
    for (size_t i = 0; i < rows.size(); ++i) {
        json += i ? ",{" : "{";
        std::string line;
        for (size_t j = 0; j < rows[i].size(); ++j) {
            json += (j ? "," : "") + JsonString(rows[i][j].first) + ":" + JsonString(rows[i][j].second);
            line += (j ? "  " : "") + rows[i][j].first + "=" + rows[i][j].second;
        }
        json += "}";
        text_.push_back(line);
    }
    fields_.emplace_back(key, json + "]");
    if (rows.empty()) text_.push_back("(no " + key + ")");
}

void Output::Note(const std::string &text) { text_.push_back(text); }

int Output::Finish(int exitStatus) {
    if (json_) {
        std::string json = "{";
        for (size_t i = 0; i < fields_.size(); ++i) {
            json += (i ? "," : "") + JsonString(fields_[i].first) + ":" + fields_[i].second;
        }
        std::printf("%s}\n", json.c_str());
    } else {
        for (const std::string &line : text_) std::printf("%s\n", line.c_str());
    }
    return exitStatus;
}

int Output::Fail(const std::string &operation) {
    const std::string code = ErrorCodeText(ORLICErrGet());
    fields_.emplace_back("ok", "false");
    fields_.emplace_back("error", JsonString(operation + " failed: " + code));
    if (!json_) std::fprintf(stderr, "xavoprinter: %s failed: %s\n", operation.c_str(), code.c_str());
    return Finish(1);
}

}  // namespace cli
