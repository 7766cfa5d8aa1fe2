// What the round-trip targets of the platform's file forms share: a
// scratch file in a private directory (on tmpfs where there is one: the
// writers flush every replacement to disk, and millions of runs must not
// wear a disk out), and the string hash as a map.
#pragma once

#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>

#include "fuzz/fuzz_support.h"
#include "internal/guards.h"
#include "xavocore.h"

namespace xavo::fuzz {

using TextMap = std::map<std::string, std::string>;

// The file that each run starts from scratch.  The directory is made once
// per process and removed when it ends.
class ScratchFile {
public:
    explicit ScratchFile(const char *szName) {
        static const std::string dir = MakeDir();
        path_ = dir + "/" + szName;
    }
    const char *path() const { return path_.c_str(); }

    void Write(std::string_view text) const {
        std::ofstream out(path_, std::ios::binary | std::ios::trunc);
        out.write(text.data(), static_cast<std::streamsize>(text.size()));
        if (!out.flush()) std::abort();
    }
    std::string Read() const {
        std::ifstream in(path_, std::ios::binary);
        std::ostringstream text;
        text << in.rdbuf();
        return text.str();
    }

private:
    static std::string MakeDir() {
        const char *szBase = access("/dev/shm", W_OK) == 0 ? "/dev/shm" : "/tmp";
        std::string tmpl = std::string(szBase) + "/xavo-fuzz-XXXXXX";
        if (mkdtemp(tmpl.data()) == nullptr) std::abort();
        static std::string removeAtExit;
        removeAtExit = tmpl;
        std::atexit([] {
            std::error_code ignored;
            std::filesystem::remove_all(removeAtExit, ignored);
        });
        return tmpl;
    }
    std::string path_;
};

inline TextMap HashToMap(const ORLICSzHash *pHash) {
    TextMap map;
    xavo::SzList keys(ORLICSzListAlloc(64));
    if (!keys || ORLICSzHashEnumKey(pHash, keys.addr()) < 0) std::abort();
    for (int i = 0; i < xavo::ListCount(keys.get()); ++i) {
        const char *szKey = xavo::ListItem(keys.get(), i);
        map[szKey] = ORLICSzHashGetValue(pHash, szKey);
    }
    return map;
}

// A text of the appliance's files: what comes after a NUL byte in a
// name or value never reaches the file, and a file holds no NUL bytes.
inline std::string CText(const std::string &text) { return text.c_str(); }
inline std::string NoNul(std::string text) {
    text.erase(std::remove(text.begin(), text.end(), '\0'), text.end());
    return text;
}

}  // namespace xavo::fuzz
