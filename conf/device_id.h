// Reading IEEE 1284 device ID strings ("MFG:ACME;MDL:Model 100;CMD:PCL;").
//
// The appliance reads them two ways, and the two differ on purpose: the key
// search looks for a key anywhere in the text, ignoring case, and tries its
// keys in a fixed order; the pair walk reads the string pair by pair and
// compares whole keys exactly.  Both are pure functions over the text.
#pragma once

#include <optional>
#include <string_view>

namespace xavo {

// The value after the first case-insensitive occurrence of szKey (which
// includes its colon), up to the next ";" or the end.  nullopt when the key
// does not occur.
std::optional<std::string_view> FindDeviceIdKey(std::string_view id, std::string_view key);

struct BrandModel {
    std::optional<std::string_view> brand;  // "MFG" or "MANUFACTURER"
    std::optional<std::string_view> model;  // "MDL" or "MODEL"
};
// The pair walk: the first pair carrying either form of each item.
BrandModel WalkDeviceIdPairs(std::string_view id);

}  // namespace xavo
