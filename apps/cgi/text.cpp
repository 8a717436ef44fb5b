#include "text.h"

#include <json/value.h>
#include <json/writer.h>

#include <algorithm>
#include <cstdint>
#include <cstring>

#include "base/hex.h"
#include "base/json_text.h"

namespace orvel::cgi {
namespace {

// The first trail byte is what distinguishes overlong forms, surrogates and numbers above U+10FFFF.
struct Lead {
    size_t length;
    unsigned char low, high;  // of the first trail byte
};

Lead leadOf(unsigned char byte) {
    if (byte < 0x80) return {1, 0, 0};
    if (byte >= 0xC2 && byte <= 0xDF) return {2, 0x80, 0xBF};
    if (byte == 0xE0) return {3, 0xA0, 0xBF};
    if (byte == 0xED) return {3, 0x80, 0x9F};
    if (byte >= 0xE1 && byte <= 0xEF) return {3, 0x80, 0xBF};
    if (byte == 0xF0) return {4, 0x90, 0xBF};
    if (byte >= 0xF1 && byte <= 0xF3) return {4, 0x80, 0xBF};
    if (byte == 0xF4) return {4, 0x80, 0x8F};
    return {0, 0, 0};
}

// Length of the well-formed sequence at the front of `rest`, 0 when there is none. `rest` is not empty.
size_t sequence(std::string_view rest) {
    const Lead lead = leadOf(static_cast<unsigned char>(rest[0]));
    if (lead.length > rest.size()) return 0;
    for (size_t i = 1; i < lead.length; ++i) {
        const auto trail = static_cast<unsigned char>(rest[i]);
        const bool fits = i == 1 ? trail >= lead.low && trail <= lead.high : (trail & 0xC0) == 0x80;
        if (!fits) return 0;
    }
    return lead.length;
}

size_t asciiPrefix(std::string_view text) {
    size_t length = 0;
    for (uint64_t word; length + sizeof word <= text.size(); length += sizeof word) {
        std::memcpy(&word, text.data() + length, sizeof word);
        if ((word & 0x8080808080808080U) != 0) break;
    }
    return length;
}

bool isUnreserved(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
           std::string_view("-._~/").find(c) != std::string_view::npos;
}

std::string_view textOf(const Json::Value& value) {
    const char* begin = nullptr;
    const char* end = nullptr;
    value.getString(&begin, &end);
    return {begin, static_cast<size_t>(end - begin)};
}

void appendMembers(const Json::Value& value, std::string& out) {
    const bool named = value.isObject();
    out += named ? '{' : '[';
    for (auto at = value.begin(); at != value.end(); ++at) {
        if (at != value.begin()) out += ',';
        if (named) {
            const char* end = nullptr;
            const char* name = at.memberName(&end);
            appendJsonText({name, static_cast<size_t>(end - name)}, out);
            out += ':';
        }
        appendJson(*at, out);
    }
    out += named ? '}' : ']';
}

}  // namespace

bool isUtf8(std::string_view bytes) {
    for (bytes.remove_prefix(asciiPrefix(bytes)); !bytes.empty();) {
        const size_t length = sequence(bytes);
        if (length == 0) return false;
        bytes.remove_prefix(length);
    }
    return true;
}

std::string readable(std::string_view bytes) {
    std::string out;
    out.reserve(bytes.size());
    while (!bytes.empty()) {
        const size_t length = sequence(bytes);
        out += length > 0 ? bytes.substr(0, length) : std::string_view("\xEF\xBF\xBD");
        bytes.remove_prefix(std::max<size_t>(length, 1));
    }
    return out;
}

std::string percentEncode(std::string_view bytes) {
    std::string out;
    for (const char c : bytes) {
        if (isUnreserved(c)) {
            out += c;
        } else {
            out += '%';
            appendHex(c, out, kUpperHex);
        }
    }
    return out;
}

std::optional<std::string> percentDecode(std::string_view text) {
    std::string out;
    for (size_t i = 0; i < text.size(); ++i) {
        char byte = text[i];
        if (byte == '%') {
            const int high = i + 2 < text.size() ? hexValue(text[i + 1]) : -1;
            const int low = i + 2 < text.size() ? hexValue(text[i + 2]) : -1;
            if (high < 0 || low < 0) return std::nullopt;
            byte = static_cast<char>(high << 4 | low);
            i += 2;
        }
        if (byte == '\0') return std::nullopt;
        out += byte;
    }
    return out;
}

void appendJson(const Json::Value& value, std::string& out) {
    switch (value.type()) {
        case Json::nullValue:
            out += "null";
            break;
        case Json::intValue:
            out += std::to_string(value.asLargestInt());
            break;
        case Json::uintValue:
            out += std::to_string(value.asLargestUInt());
            break;
        case Json::realValue:
            out += Json::valueToString(value.asDouble());
            break;
        case Json::booleanValue:
            out += value.asBool() ? "true" : "false";
            break;
        case Json::stringValue:
            appendJsonText(textOf(value), out);
            break;
        case Json::arrayValue:
        case Json::objectValue:
            appendMembers(value, out);
    }
}

}  // namespace orvel::cgi
