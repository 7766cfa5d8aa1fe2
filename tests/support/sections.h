// Reading and writing whole sections of the appliance's section files, and
// reading its table files, through the platform, for tests that set up or
// check them; and the texts of a string list.
#pragma once

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "xavocore.h"

namespace xavo::test {

using Section = std::map<std::string, std::string>;

// The keys and values of a hash, which is freed.
inline Section TakeHash(ORLICSzHash *hash) {
    ORLICSzList *keys = ORLICSzListAlloc(1024);
    Section out;
    const int n = ORLICSzHashEnumKey(hash, &keys);
    for (int i = 0; i < n; ++i) out[ORLICSzListGet(keys, i)] = ORLICSzHashGetValue(hash, ORLICSzListGet(keys, i));
    ORLICSzListFree(keys);
    ORLICSzHashFree(hash);
    return out;
}

inline Section ReadSection(const std::string &path, const std::string &name) {
    ORLICSzHash *hash = ORLICSzHashAlloc(512);
    ORLICFileGetSection(path.c_str(), name.c_str(), &hash);
    return TakeHash(hash);
}

// The key-value pairs of a table file (nptab, usbtab).
inline Section ReadPairs(const std::string &path) {
    ORLICSzHash *hash = ORLICSzHashAlloc(1024);
    ORLICFileGetPair(path.c_str(), &hash);
    return TakeHash(hash);
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
