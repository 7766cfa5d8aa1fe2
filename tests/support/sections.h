// Reading and writing whole sections of the appliance's section files
// through the platform, for tests that set up or check them, and the texts
// of a string list.
#pragma once

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

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

inline std::vector<std::string> Items(ORLICSzList *list) {
    std::vector<std::string> out;
    for (int i = 0; i < ORLIC_SZLIST_COUNT(list); ++i) out.push_back(ORLICSzListGet(list, i));
    return out;
}

}  // namespace xavo::test
