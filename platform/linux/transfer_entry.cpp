#include "transfer_entry.h"

#include <unicode/utf8.h>

#include <array>
#include <cstdio>

namespace vexo {
namespace {

constexpr char kDigits[] = "0123456789ABCDEF";

// Appends `text` as a JSON string and reports whether it is UTF-8: bytes that are not become U+FFFD.
bool appendText(std::string& out, std::string_view text) {
    bool valid = true;
    const auto length = static_cast<int32_t>(text.size());
    out += '"';
    for (int32_t next = 0; next < length;) {
        const int32_t begin = next;
        UChar32 character = 0;
        U8_NEXT(text.data(), next, length, character);
        if (character < 0) {
            valid = false;
            out += "\xEF\xBF\xBD";
        } else if (character == '"' || character == '\\') {
            out += '\\';
            out += static_cast<char>(character);
        } else if (character < 0x20 || character == 0x7F) {
            out += "\\u00";
            out += kDigits[character >> 4];
            out += kDigits[character & 15];
        } else {
            out += text.substr(static_cast<size_t>(begin), static_cast<size_t>(next - begin));
        }
    }
    out += '"';
    return valid;
}

std::string percentEncoded(std::string_view text) {
    std::string out;
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte > 0x20 && byte < 0x7F && byte != '"' && byte != '\\' && byte != '%') {
            out += c;
        } else {
            out += {'%', kDigits[byte >> 4], kDigits[byte & 15]};
        }
    }
    return out;
}

// A text field; one that is no UTF-8 is followed by its bytes.
void appendField(std::string& out, const char* key, std::string_view text) {
    out += ",\"" + std::string(key) + "\":";
    if (!appendText(out, text)) out += ",\"" + std::string(key) + "_raw\":\"" + percentEncoded(text) + '"';
}

std::string timeText(time_t time) {
    std::tm utc{};
    std::array<char, 32> text{};
    if (gmtime_r(&time, &utc) == nullptr) return "";
    return {text.data(), strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &utc)};
}

}  // namespace

std::string buildTransferEntry(const TransferEntry& entry) {
    std::string line = "{\"time\":\"" + timeText(entry.time) + '"';
    appendField(line, "address", entry.address);
    appendField(line, "user", entry.user);
    appendField(line, "action", entry.action);
    line += ",\"size\":" + std::to_string(entry.size);
    appendField(line, "path", entry.path);
    line += entry.flag ? ",\"flag\":true}\n" : ",\"flag\":false}\n";
    return line;
}

}  // namespace vexo
