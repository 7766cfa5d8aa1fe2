// Reading and writing whole sections of the appliance's section files
// through the platform, for tests that set up or check them.
#pragma once

#include <gtest/gtest.h>

#include <map>
#include <string>

#include "xavocore.h"

namespace xavo::test {

using Section = std::map<std::string, std::string>;

inline Section ReadSection(const std::string &path, const std::string &name) {
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    ORLICFileGetSection(path.c_str(), name.c_str(), &hash);
    ORLICSzList *keys = ORLICSzListAlloc(256);
    Section out;
    int n = ORLICSzHashEnumKey(hash, &keys);
    for (int i = 0; i < n; ++i) out[ORLICSzListGet(keys, i)] = ORLICSzHashGetValue(hash, ORLICSzListGet(keys, i));
    ORLICSzListFree(keys);
    ORLICSzHashFree(hash);
    return out;
}

inline void WriteSection(const std::string &path, const std::string &name, const Section &keys) {
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    for (const auto &[k, v] : keys) ORLICSzHashSetValue(&hash, k.c_str(), v.c_str());
    EXPECT_GT(ORLICFileAddSection(path.c_str(), name.c_str(), hash, "\t%s = %s\n"), 0) << name;
    ORLICSzHashFree(hash);
}

}  // namespace xavo::test
