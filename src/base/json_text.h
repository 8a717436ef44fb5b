// Texts as JSON, as jsoncpp writes them when it leaves UTF-8 alone.
#ifndef ORVEL_BASE_JSON_TEXT_H
#define ORVEL_BASE_JSON_TEXT_H

#include <array>
#include <cstddef>
#include <string>
#include <string_view>

#include "base/hex.h"

namespace orvel {

constexpr size_t kLongestJsonEscape = 6;  // "\u001f"

// What follows the backslash for a byte: 0 none (the byte stands for itself), 'u' a hexadecimal escape.
inline constexpr std::array<char, 256> kJsonEscapes = [] {
    std::array<char, 256> escapes{};
    for (size_t byte = 0; byte < 0x20; ++byte) escapes[byte] = 'u';
    escapes['\b'] = 'b';
    escapes['\f'] = 'f';
    escapes['\n'] = 'n';
    escapes['\r'] = 'r';
    escapes['\t'] = 't';
    escapes['"'] = '"';
    escapes['\\'] = '\\';
    return escapes;
}();

// Writes `value` with its quotes at a place that has room for it, and returns where that ends.
inline char* putJsonText(char* at, std::string_view value) {
    *at++ = '"';
    for (const char c : value) {
        const char escape = kJsonEscapes[static_cast<unsigned char>(c)];
        if (escape == 0) {
            *at++ = c;
            continue;
        }
        *at++ = '\\';
        *at++ = escape;
        if (escape != 'u') continue;
        *at++ = '0';
        *at++ = '0';
        *at++ = kLowerHex[static_cast<unsigned char>(c) >> 4];
        *at++ = kLowerHex[c & 15];
    }
    *at++ = '"';
    return at;
}

inline void appendJsonText(std::string_view value, std::string& out) {
    const size_t before = out.size();
    out.resize(before + kLongestJsonEscape * value.size() + 2);
    out.resize(static_cast<size_t>(putJsonText(out.data() + before, value) - out.data()));
}

}  // namespace orvel

#endif
