// The core's string lists and hashes, for the core's own use: the file
// operations fill them without going through (and being counted as) the
// exported operations.
#pragma once

#include <string_view>
#include <utility>
#include <vector>

#include "xavocore.h"

namespace xavo::core {

ORLICSzList *NewList(int32_t iCapacity);
// Appends a copy; the list may move.  False when memory is short, with the
// list unchanged.
bool ListPush(ORLICSzList **ppList, std::string_view text);
// Frees the items from iCount on: undoes the pushes of a failed operation.
void ListTruncate(ORLICSzList *pList, int32_t iCount);

ORLICSzHash *NewHash(int32_t iCapacity);
// Adds or replaces; the hash may move.  Throws std::bad_alloc when memory
// is short, with the hash unchanged.
void HashSet(ORLICSzHash **ppHash, std::string_view key, std::string_view value);
const char *HashGet(const ORLICSzHash *pHash, std::string_view key);
// Key and value texts in insertion order; valid until the hash changes.
std::vector<std::pair<const char *, const char *>> HashPairs(const ORLICSzHash *pHash);

}  // namespace xavo::core
