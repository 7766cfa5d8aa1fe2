// Bounded copies into the fixed-size text fields of the appliance's
// records.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace xavo {

// Copies sv into dst[cbDst], cut to cbDst - 1 bytes and NUL-terminated.
// Does nothing when cbDst is 0 or less.
inline void CopyText(char *dst, std::int64_t cbDst, std::string_view sv) {
    if (dst == nullptr || cbDst <= 0) return;
    size_t n = sv.size();
    if (n > static_cast<size_t>(cbDst - 1)) n = static_cast<size_t>(cbDst - 1);
    std::memcpy(dst, sv.data(), n);
    dst[n] = '\0';
}

template <size_t N>
inline void CopyText(char (&dst)[N], std::string_view sv) {
    CopyText(dst, static_cast<std::int64_t>(N), sv);
}

// Length of a fixed-size field's text, never reading past the field even
// when the caller left it unterminated.
template <size_t N>
inline std::string_view FieldText(const char (&field)[N]) {
    return std::string_view(field, strnlen(field, N));
}

}  // namespace xavo
