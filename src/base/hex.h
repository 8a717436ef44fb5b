// Bytes as hexadecimal digits.
#ifndef ORVEL_BASE_HEX_H
#define ORVEL_BASE_HEX_H

#include <string>
#include <string_view>

namespace orvel {

inline constexpr std::string_view kLowerHex = "0123456789abcdef";
inline constexpr std::string_view kUpperHex = "0123456789ABCDEF";

// Appends the two digits of a byte.
inline void appendHex(char byte, std::string& out, std::string_view digits = kLowerHex) {
    const auto value = static_cast<unsigned char>(byte);
    out += digits[value >> 4];
    out += digits[value & 15];
}

// The value of a digit in either case; -1 for any other character.
constexpr int hexValue(char digit) {
    if (digit >= '0' && digit <= '9') return digit - '0';
    if (digit >= 'a' && digit <= 'f') return digit - 'a' + 10;
    if (digit >= 'A' && digit <= 'F') return digit - 'A' + 10;
    return -1;
}

}  // namespace orvel

#endif
