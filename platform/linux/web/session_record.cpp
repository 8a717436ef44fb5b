#include "web/session_record.h"

#include <algorithm>
#include <charconv>

#include "settings/settings_text.h"

namespace vexo {
namespace {

constexpr size_t kSessionIdLength = 32;

bool fitsLine(std::string_view text) {
    return std::all_of(text.begin(), text.end(), [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F; });
}

std::string line(std::string_view key, std::string_view value) {
    std::string out(key);
    out.append("=\"").append(value).append("\"\n");
    return out;
}

bool isHexDigit(char c) {
    return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f');
}

}  // namespace

std::optional<std::string> buildSessionRecord(const SessionRecord& record) {
    if (record.user.empty() || !fitsLine(record.user) || !fitsLine(record.address)) return {};
    return line("user", record.user) + line("address", record.address) + line("time", std::to_string(record.time));
}

std::optional<SessionRecord> parseSessionRecord(std::string_view text) {
    const auto settings = parseSettings(text, "=");
    const auto user = findSetting(settings, "user");
    const auto time = findSetting(settings, "time");
    if (!user || user->empty() || !time) return {};
    SessionRecord record{std::string(*user), std::string(findSetting(settings, "address").value_or("")), 0};
    const auto [end, error] = std::from_chars(time->data(), time->data() + time->size(), record.time);
    if (error != std::errc() || end != time->data() + time->size()) return {};
    return record;
}

bool isSessionId(std::string_view text) {
    return text.size() == kSessionIdLength && std::all_of(text.begin(), text.end(), isHexDigit);
}

}  // namespace vexo
