// Round trip of the platform's section files (the printer configuration
// file, the Samba share file): on any existing file, a section written by
// ORLICFileAddSection or ORLICFileSetSection, or a key set by
// ORLICFileSetSectionValue, reads back as written, or the write is refused
// and the file is left as it was; every other section reads as before.
//
// "As written" is what the file form can hold: a value loses the blanks
// around it (Samba's readers drop them) and its control characters become
// blanks (a line break would forge lines of its own).
#include <fuzzer/FuzzedDataProvider.h>

#include <vector>

#include "common/text_files.h"
#include "fuzz/file_support.h"

namespace {

using xavo::fuzz::CText;
using xavo::fuzz::TextMap;
constexpr char kLineFormat[] = "\t%s = %s\n";

std::string Stored(const std::string &value) {
    std::string clean = value;
    for (char &c : clean) {
        if (xavo::platform::IsControl(c)) c = ' ';
    }
    return std::string(xavo::platform::Trim(clean));
}

// Every section of a file's text, by name, read by the rules the
// platform's readers follow: a key line belongs to the last header before
// it, a key set twice keeps its last value, sections of one name merge.
// Built from the platform's line parsers in one pass; the platform's own
// section reader is checked against it for the section written.
std::map<std::string, TextMap> Sections(const std::string &text) {
    std::map<std::string, TextMap> sections;
    TextMap *pCurrent = nullptr;
    for (const std::string &line : xavo::platform::SplitLines(text)) {
        if (auto name = xavo::platform::ParseSectionHeader(line)) {
            pCurrent = &sections[CText(std::string(*name))];
        } else if (auto kv = xavo::platform::ParseSectionKeyLine(line); kv && pCurrent != nullptr) {
            (*pCurrent)[std::string(kv->key)] = std::string(kv->value);
        }
    }
    return sections;
}

TextMap PlatformSection(const char *szPath, const std::string &name) {
    xavo::SzHash hash(ORLICSzHashAlloc(16));
    ORLICFileGetSection(szPath, name.c_str(), hash.addr());
    return xavo::fuzz::HashToMap(hash.get());
}

void CheckValue(const char *szPath, const std::string &name, const std::string &key, const std::string &value) {
    char szBuf[512];
    FUZZ_CHECK(ORLICFileGetSectionValue(szPath, name.c_str(), key.c_str(), szBuf, sizeof szBuf) >= 0);
    FUZZ_CHECK(std::string(szBuf) == value.substr(0, sizeof szBuf - 1));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    FuzzedDataProvider in(data, size);
    const int iOperation = in.ConsumeIntegralInRange(0, 2);
    const std::string name = CText(in.ConsumeRandomLengthString(64));
    std::vector<std::pair<std::string, std::string>> pairs;
    for (int n = in.ConsumeIntegralInRange(0, 6); n > 0; --n) {
        std::string key = CText(in.ConsumeRandomLengthString(32));
        pairs.emplace_back(key, CText(in.ConsumeRandomLengthString(128)));
    }
    const std::string initial = xavo::fuzz::NoNul(in.ConsumeRemainingBytesAsString());

    const xavo::fuzz::ScratchFile file("printer.conf");
    file.Write(initial);
    std::map<std::string, TextMap> before = Sections(initial);

    xavo::SzHash hash(ORLICSzHashAlloc(16));
    TextMap written;
    for (const auto &[key, value] : pairs) {
        FUZZ_CHECK(ORLICSzHashSetValue(hash.addr(), key.c_str(), value.c_str()) == 0);
        written[key] = Stored(value);
    }

    std::map<std::string, TextMap> expected = before;
    int32_t iResult = 0;
    bool bWritten = false;
    if (iOperation == 0) {
        iResult = ORLICFileAddSection(file.path(), name.c_str(), hash.get(), kLineFormat);
        // 0: a section of that name is there already, and stays as it was.
        FUZZ_CHECK(iResult != 0 || before.contains(name));
        bWritten = iResult > 0;
        if (bWritten) expected[name] = written;
    } else if (iOperation == 1) {
        iResult = ORLICFileSetSection(file.path(), name.c_str(), name.c_str(), hash.get(), kLineFormat);
        bWritten = iResult >= 1;
        if (bWritten) expected[name] = written;
    } else if (!pairs.empty()) {
        const auto &[key, value] = pairs.front();
        iResult = ORLICFileSetSectionValue(file.path(), name.c_str(), key.c_str(), value.c_str());
        bWritten = iResult >= 0;
        // Only an existing section gets a key.
        FUZZ_CHECK(!bWritten || before.contains(name));
        if (bWritten) expected[name][key] = Stored(value);
    }
    if (!bWritten) {
        FUZZ_CHECK(file.Read() == initial);
        return 0;
    }
    FUZZ_CHECK(Sections(file.Read()) == expected);
    FUZZ_CHECK(PlatformSection(file.path(), name) == expected[name]);
    // The single-key reader agrees (one key: each read parses the file).
    if (!expected[name].empty()) CheckValue(file.path(), name, expected[name].begin()->first, expected[name].begin()->second);
    return 0;
}
