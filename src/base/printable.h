// Text from users on its way into a log line.
#ifndef ORVEL_BASE_PRINTABLE_H
#define ORVEL_BASE_PRINTABLE_H

#include <string>
#include <string_view>

#include "base/hex.h"

namespace orvel {

// `text` with control bytes (0x00 to 0x1F and 0x7F) written as "\xNN", so that one call is one line of the log.
inline std::string printable(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte >= 0x20 && byte != 0x7F) {
            out += c;
        } else {
            out += "\\x";
            appendHex(c, out, kUpperHex);
        }
    }
    return out;
}

// What printf's "%s" shows for a null text.
inline std::string printable(const char* text) {
    return text == nullptr ? std::string("(null)") : printable(std::string_view(text));
}

inline std::string printable(const std::string& text) {
    return printable(std::string_view(text));
}

}  // namespace orvel

#endif
