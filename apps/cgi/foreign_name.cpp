#include "foreign_name.h"

#include <unicode/ucnv.h>

#include <algorithm>

#include "text.h"

namespace orvel::cgi {
namespace {

bool isBetween(char byte, unsigned first, unsigned last) {
    const unsigned value = static_cast<unsigned char>(byte);
    return first <= value && value <= last;
}

// Two characters of two bytes in a row, as words of other languages hardly ever give them.
bool looksJapanese(std::string_view bytes) {
    int run = 0, longest = 0;
    for (size_t i = 0; i < bytes.size(); ++i) {
        if (!isBetween(bytes[i], 0x81, 0x9F) && !isBetween(bytes[i], 0xE0, 0xFC)) {
            if (isBetween(bytes[i], 0x80, 0xFF) && !isBetween(bytes[i], 0xA1, 0xDF)) return false;
            run = 0;
            continue;
        }
        if (++i == bytes.size()) return false;
        if (!isBetween(bytes[i], 0x40, 0x7E) && !isBetween(bytes[i], 0x80, 0xFC)) return false;
        longest = std::max(longest, ++run);
    }
    return longest >= 2;
}

// "" where ICU does not know the encoding.
std::string inUtf8(std::string_view bytes, const char* encoding) {
    std::string text(bytes.size() * 3 + 1, '\0');  // what one byte comes to at most
    UErrorCode error = U_ZERO_ERROR;
    const int32_t length = ucnv_convert("UTF-8", encoding, text.data(), static_cast<int32_t>(text.size()), bytes.data(),
                                        static_cast<int32_t>(bytes.size()), &error);
    if (U_FAILURE(error) != 0) return "";
    text.resize(static_cast<size_t>(length));
    return text;
}

}  // namespace

std::string foreignName(std::string_view bytes) {
    const std::string text = inUtf8(bytes, looksJapanese(bytes) ? "windows-31j" : "ibm-437");
    return text.empty() ? readable(bytes) : text;
}

}  // namespace orvel::cgi
