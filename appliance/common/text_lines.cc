// The line parsers and formats of text_files.h: pure functions of text,
// no file touched.
#include <algorithm>
#include <cstring>

#include "common/text_files.h"

namespace xavo::platform {
namespace {

bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n' || c == '\v' || c == '\f'; }

}  // namespace

std::string_view Trim(std::string_view text) {
    while (!text.empty() && IsBlank(text.front())) text.remove_prefix(1);
    while (!text.empty() && IsBlank(text.back())) text.remove_suffix(1);
    return text;
}

bool IsControl(char c) {
    auto u = static_cast<unsigned char>(c);
    return u < 0x20 || u == 0x7f;
}

bool HasControl(std::string_view text) {
    for (char c : text) {
        if (IsControl(c)) return true;
    }
    return false;
}

std::vector<std::string> SplitLines(std::string_view text) {
    std::vector<std::string> lines;
    while (!text.empty()) lines.emplace_back(NextLine(&text));
    return lines;
}

std::string_view NextLine(std::string_view *pRest) {
    size_t nl = pRest->find('\n');
    size_t len = nl == std::string_view::npos ? pRest->size() : nl + 1;
    std::string_view line = pRest->substr(0, len);
    pRest->remove_prefix(len);
    return line;
}

std::string JoinLines(const std::vector<std::string> &lines) {
    std::string text;
    for (const std::string &line : lines) text += line;
    return text;
}

int32_t CopyValue(std::string_view value, char *szBuf, int32_t cbBuf) {
    size_t n = std::min(value.size(), static_cast<size_t>(cbBuf) - 1);
    std::memcpy(szBuf, value.data(), n);
    szBuf[n] = '\0';
    return static_cast<int32_t>(n);
}

std::optional<std::string_view> ParseSectionHeader(std::string_view line) {
    line = Trim(line);
    if (line.empty() || line.front() != '[') return std::nullopt;
    size_t close = line.rfind(']');
    if (close == std::string_view::npos || close == 0) return std::nullopt;
    return line.substr(1, close - 1);
}

std::optional<KeyValue> ParseSectionKeyLine(std::string_view line) {
    line = Trim(line);
    if (line.empty() || line.front() == '#' || line.front() == ';' || line.front() == '[') return std::nullopt;
    size_t eq = line.find('=');
    if (eq == std::string_view::npos) return std::nullopt;
    KeyValue kv{Trim(line.substr(0, eq)), Trim(line.substr(eq + 1))};
    if (kv.key.empty()) return std::nullopt;
    return kv;
}

std::optional<KeyValue> ParseKeyValueLine(std::string_view line) {
    line = Trim(line);
    if (line.empty() || line.front() == '#') return std::nullopt;
    size_t eq = line.find('=');
    if (eq == std::string_view::npos) return std::nullopt;
    KeyValue kv{Trim(line.substr(0, eq)), Trim(line.substr(eq + 1))};
    if (kv.key.empty()) return std::nullopt;
    if (kv.value.size() >= 2 && kv.value.front() == '"' && kv.value.back() == '"') {
        kv.value = kv.value.substr(1, kv.value.size() - 2);
    }
    return kv;
}

bool FormatLine(const char *szFormat, std::string_view key, std::string_view value, std::string *pLine) {
    if (szFormat == nullptr) return false;
    std::string line;
    int nArgs = 0;
    for (const char *p = szFormat; *p != '\0'; ++p) {
        if (*p != '%') {
            line.push_back(*p);
            continue;
        }
        ++p;
        if (*p == '%') {
            line.push_back('%');
        } else if (*p == 's' && nArgs < 2) {
            line.append(nArgs == 0 ? key : value);
            ++nArgs;
        } else {
            return false;
        }
    }
    if (nArgs != 2) return false;
    if (line.empty() || line.back() != '\n') line.push_back('\n');
    *pLine = std::move(line);
    return true;
}

}  // namespace xavo::platform
