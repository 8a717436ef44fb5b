#include "web/session_record.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "settings/settings_text.h"

namespace vexo {
namespace {

constexpr size_t kSessionIdLength = 32;
constexpr size_t kLongestBrowser = 200;
constexpr std::string_view kVersion = "2";
constexpr std::string_view kLogIn = "log-in";

bool fitsLine(std::string_view text) {
    return std::all_of(text.begin(), text.end(), [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F; });
}

std::string line(std::string_view key, std::string_view value) {
    std::string out(key);
    out.append("=\"").append(value).append("\"\n");
    return out;
}

template <class Number>
bool parseWhole(std::string_view text, Number& number) {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size();
}

bool isHexDigit(char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f');
}

}  // namespace

std::optional<std::string> buildSessionRecord(const SessionRecord& record) {
    if (record.user.empty() || !fitsLine(record.user) || !fitsLine(record.address)) return {};
    std::string text = line("version", kVersion) + line("user", record.user) + line("address", record.address) +
                       line("time", std::to_string(record.time));
    if (!record.loggedIn) return text;
    std::string browser = record.browser.substr(0, kLongestBrowser);
    std::replace_if(
        browser.begin(), browser.end(),
        [](char byte) {
            return !fitsLine({&byte, 1});
        },
        ' ');
    return text + line("by", kLogIn) + line("uid", std::to_string(record.uid)) + line("name", record.name) +
           line("browser", browser);
}

std::optional<SessionRecord> parseSessionRecord(std::string_view text) {
    const auto settings = parseSettings(text, "=");
    if (findSetting(settings, "version").value_or("") != kVersion) return {};
    const auto user = findSetting(settings, "user");
    const auto time = findSetting(settings, "time");
    if (!user || user->empty() || !time) return {};
    const auto valueOf = [&](const char* key) { return std::string(findSetting(settings, key).value_or("")); };
    SessionRecord record;
    record.user = *user;
    record.address = valueOf("address");
    record.loggedIn = valueOf("by") == kLogIn;
    record.name = valueOf("name");
    record.browser = valueOf("browser");
    const bool whole = parseWhole(*time, record.time) && (!record.loggedIn || parseWhole(valueOf("uid"), record.uid));
    return whole ? std::optional(std::move(record)) : std::nullopt;
}

bool isSessionId(std::string_view text) {
    return text.size() == kSessionIdLength && std::all_of(text.begin(), text.end(), isHexDigit);
}

}  // namespace vexo
