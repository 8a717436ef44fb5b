#include "vexo/web.h"

#include <strings.h>
#include <unistd.h>
#include <memory>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <vector>

#include "fault_gate.h"
#include "web/cgi_text.h"

namespace VEXO {
namespace {

constexpr size_t kMaxBody = size_t{1} << 20;
constexpr std::string_view kFormType = "application/x-www-form-urlencoded";

std::string environment(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

// The type alone or with parameters behind it.
bool isFormPost() {
    const std::string type = environment("CONTENT_TYPE");
    return environment("REQUEST_METHOD") == "POST" &&
           strncasecmp(type.c_str(), kFormType.data(), kFormType.size()) == 0 &&
           std::strchr("; \t", type[kFormType.size()]) != nullptr;
}

// Reads exactly `length` bytes of standard input; false when there are fewer.
bool readBody(size_t length, std::string& body) {
    body.resize(length);
    size_t have = 0;
    while (have < length) {
        const ssize_t got = read(STDIN_FILENO, body.data() + have, length - have);
        if (got == 0 || (got < 0 && errno != EINTR)) return false;
        if (got > 0) have += static_cast<size_t>(got);
    }
    return true;
}

// False for a body that is not taken: too long, cut short, or with a NUL byte, which no form holds.
bool readForm(size_t longest, vexo::FormFields& fields) {
    const std::string announced = environment("CONTENT_LENGTH");
    if (announced.empty()) return true;
    size_t length = 0;
    const auto [end, error] = std::from_chars(announced.data(), announced.data() + announced.size(), length);
    if (error != std::errc() || end != announced.data() + announced.size() || length > longest) return false;
    std::string body;
    if (!readBody(length, body) || body.find('\0') != std::string::npos) return false;
    vexo::parseForm(body, fields);
    return true;
}

}  // namespace

struct WebCGI::Impl {
    vexo::FormFields fields;
    std::string cookies;
    std::vector<std::string> newCookies;
    bool bodyRefused = false;

    [[nodiscard]] const std::string* find(const std::string& name) const {
        const auto found =
            std::find_if(fields.begin(), fields.end(), [&](const auto& field) { return field.first == name; });
        return found == fields.end() ? nullptr : &found->second;
    }
};

WebCGI::WebCGI() : WebCGI(kMaxBody) {}

WebCGI::WebCGI(unsigned long longestForm) {
    auto impl = std::make_unique<Impl>();
    vexo::parseForm(environment("QUERY_STRING"), impl->fields);
    impl->cookies = environment("HTTP_COOKIE");
    if (isFormPost()) impl->bodyRefused = !readForm(longestForm, impl->fields);
    impl_ = impl.release();
}

WebCGI::~WebCGI() {
    delete impl_;
}

std::string WebCGI::GetParam(const std::string& name, const std::string& def) const {
    const std::string* value = impl_->find(name);
    return value == nullptr ? def : *value;
}

std::vector<std::string> WebCGI::GetParams(const std::string& name) const {
    std::vector<std::string> values;
    for (const auto& [field, value] : impl_->fields) {
        if (field == name) values.push_back(value);
    }
    return values;
}

bool WebCGI::HasParam(const std::string& name) const {
    return impl_->find(name) != nullptr;
}

bool WebCGI::BodyRefused() const {
    return impl_->bodyRefused;
}

std::string WebCGI::GetCookie(const std::string& name, const std::string& def) const {
    return vexo::findCookie(impl_->cookies, vexo::cookieNameOf(name)).value_or(def);
}

bool WebCGI::AddCookieToHeader(const std::string& path, const std::string& name, const std::string& value) {
    VEXO_GATE("VEXO::WebCGI::AddCookieToHeader", false);
    if (!vexo::isCookieName(name) || !vexo::isCookieText(value) || !vexo::isCookieText(path)) return false;
    // No script reads it, and no other site's page sends it along but by a link.
    const bool secure = vexo::isSecureRequest();
    impl_->newCookies.push_back("Set-Cookie: " + vexo::cookieNameOf(name) + "=" + value +
                                (path.empty() ? "" : "; Path=" + path) + "; HttpOnly; SameSite=Lax" +
                                (secure ? "; Secure" : ""));
    return true;
}

void WebCGI::WriteHeader(const std::string& type) {
    for (const auto& cookie : impl_->newCookies) std::printf("%s\r\n", cookie.c_str());
    std::printf("Content-Type: %s\r\n\r\n", type.c_str());
    impl_->newCookies.clear();
}

namespace WebAPIUtil {

Json::Value ParseToArray(const char* text, const char* separator) {
    Json::Value pieces(Json::arrayValue);
    if (text == nullptr) return pieces;
    std::string_view rest = text;
    const std::string_view cut = separator == nullptr ? "" : separator;
    while (true) {
        const size_t end = cut.empty() ? std::string_view::npos : rest.find(cut);
        const std::string_view piece = rest.substr(0, end);
        pieces.append(Json::Value(piece.data(), piece.data() + piece.size()));
        if (end == std::string_view::npos) return pieces;
        rest.remove_prefix(end + cut.size());
    }
}

}  // namespace WebAPIUtil
}  // namespace VEXO
