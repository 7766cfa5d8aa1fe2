// The platform's pure line parsers of its two file forms and its line
// formatter (appliance/common/text_lines.cc): lines split and join back to
// the text, parsed parts lie inside their line, and a line formatted from a
// key and value that the writers accept parses back to them.
#include <fuzzer/FuzzedDataProvider.h>

#include "common/text_files.h"
#include "fuzz/fuzz_support.h"

namespace {

using xavo::fuzz::Within;
namespace platform = xavo::platform;

void CheckParsers(std::string_view line) {
    if (auto name = platform::ParseSectionHeader(line)) {
        FUZZ_CHECK(Within(*name, line));
        FUZZ_CHECK(name->data()[-1] == '[' && name->data()[name->size()] == ']');
    }
    for (auto kv : {platform::ParseSectionKeyLine(line), platform::ParseKeyValueLine(line)}) {
        if (!kv) continue;
        FUZZ_CHECK(Within(kv->key, line) && Within(kv->value, line));
        FUZZ_CHECK(!kv->key.empty() && kv->key.find('=') == std::string_view::npos);
        FUZZ_CHECK(platform::Trim(kv->key) == kv->key);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    FuzzedDataProvider in(data, size);
    const std::string format = in.ConsumeRandomLengthString(32);
    const std::string key = in.ConsumeRandomLengthString(32);
    const std::string value = in.ConsumeRandomLengthString(64);
    const std::string text = in.ConsumeRemainingBytesAsString();

    std::vector<std::string> lines = platform::SplitLines(text);
    FUZZ_CHECK(platform::JoinLines(lines) == text);
    for (const std::string &line : lines) {
        FUZZ_CHECK(!line.empty() && line.find('\n') >= line.size() - 1);
        CheckParsers(line);
    }

    std::string formatted;
    if (platform::FormatLine(format.c_str(), key, value, &formatted)) {
        FUZZ_CHECK(!formatted.empty() && formatted.back() == '\n');
        CheckParsers(formatted);
    }
    // The key-value writers' own line: a key they accept (no "=", quote,
    // control character or surrounding blank, not a comment) and a value
    // without quote or control character come back as they were.
    const bool bKeyOk = !key.empty() && !platform::HasControl(key) && key.find_first_of("=\"") == std::string::npos &&
                        platform::Trim(key) == key && key.front() != '#';
    const bool bValueOk = !platform::HasControl(value) && value.find('"') == std::string::npos;
    if (bKeyOk && bValueOk && platform::FormatLine("%s=\"%s\"\n", key, value, &formatted)) {
        auto kv = platform::ParseKeyValueLine(formatted);
        FUZZ_CHECK(kv && kv->key == key && kv->value == value);
    }
    return 0;
}
