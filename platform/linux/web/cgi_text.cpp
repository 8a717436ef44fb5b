#include "web/cgi_text.h"

#include <algorithm>
#include <cstdlib>

namespace vexo {
namespace {

int hexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// The byte of the escape at the begin of `text`; 0 for none and for "%00".
int escapedByte(std::string_view text) {
    if (text.size() < 3 || text[0] != '%') return 0;
    const int high = hexDigit(text[1]);
    const int low = hexDigit(text[2]);
    return high < 0 || low < 0 ? 0 : high * 16 + low;
}

bool isTokenByte(char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') ||
           std::string_view("!#$%&'*+-.^_`|~").find(c) != std::string_view::npos;
}

}  // namespace

std::string_view trimBlanks(std::string_view text) {
    const size_t first = text.find_first_not_of(" \t");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

std::string_view takePiece(std::string_view& text, char separator) {
    const size_t end = std::min(text.find(separator), text.size());
    const std::string_view piece = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    return piece;
}

std::string decodeFormText(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (size_t i = 0; i < text.size(); ++i) {
        const int byte = escapedByte(text.substr(i));
        if (byte > 0) {
            out += static_cast<char>(byte);
            i += 2;
        } else {
            out += text[i] == '+' ? ' ' : text[i];
        }
    }
    return out;
}

void parseForm(std::string_view text, FormFields& fields) {
    while (!text.empty()) {
        std::string_view value = takePiece(text, '&');
        if (value.empty()) continue;
        const std::string_view name = takePiece(value, '=');
        fields.emplace_back(decodeFormText(name), decodeFormText(value));
    }
}

std::vector<std::pair<std::string, std::string>> parseCookies(std::string_view header) {
    std::vector<std::pair<std::string, std::string>> cookies;
    while (!header.empty()) {
        std::string_view value = takePiece(header, ';');
        if (value.find('=') == std::string_view::npos) continue;
        const std::string_view name = trimBlanks(takePiece(value, '='));
        cookies.emplace_back(name, trimBlanks(value));
    }
    return cookies;
}

bool isSecureRequest() {
    const char* https = getenv("HTTPS");
    return https != nullptr && std::string_view(https) == "on";
}

std::string sessionCookieName() {
    return isSecureRequest() ? "__Host-id" : "id";
}

std::string cookieNameOf(const std::string& name) {
    return name == "id" ? sessionCookieName() : name;
}

std::optional<std::string> findCookie(std::string_view header, std::string_view name) {
    for (auto& [cookie, value] : parseCookies(header)) {
        if (cookie == name) return std::move(value);
    }
    return {};
}

bool isCookieName(std::string_view text) {
    return !text.empty() && std::all_of(text.begin(), text.end(), isTokenByte);
}

bool isCookieText(std::string_view text) {
    return std::all_of(text.begin(), text.end(),
                       [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F && byte != ';' && byte != ','; });
}

}  // namespace vexo
