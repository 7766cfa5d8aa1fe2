// Bounded copies into the fixed-size text fields of the appliance's
// records, and what a text must not hold to go into a line of a file.
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

// A control character (C0 or DEL): in a line of a file it would break the
// line or hide what follows.
inline bool IsControlChar(unsigned char c) { return c < 0x20 || c == 0x7f; }

// Whether a text can be a key or a value of a table line KEY="VALUE" (the
// USB and network printer tables): "=" and '"' split a line when it is
// listed, a line break would add a line of its own.
inline bool FitsTableLine(std::string_view text) {
    for (unsigned char c : text) {
        if (c == '=' || c == '"' || IsControlChar(c)) return false;
    }
    return true;
}

}  // namespace xavo
