#include "settings_text.h"

#include <algorithm>

namespace vexo {
namespace {

std::string_view trim(std::string_view text) {
    const size_t first = text.find_first_not_of(" \t\r");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t\r") - first + 1);
}

// The text between the first and the last quote, so that a value may hold quotes itself. A value whose quote never
// closes stays as it stands: a torn line must not read as a whole value.
std::string_view unquote(std::string_view value) {
    const size_t last = value.rfind('"');
    if (!value.starts_with('"') || last == 0) return value;
    return value.substr(1, last - 1);
}

}  // namespace

std::optional<Setting> parseSettingLine(std::string_view line, std::string_view separator) {
    if (line.find('\0') != std::string_view::npos) return {};
    const size_t cut = separator.empty() ? std::string_view::npos : line.find(separator);
    if (cut == std::string_view::npos) return {};
    const std::string_view key = trim(line.substr(0, cut));
    if (key.empty() || key.starts_with('#')) return {};
    return Setting{key, unquote(trim(line.substr(cut + separator.size())))};
}

std::vector<Setting> parseSettings(std::string_view text, std::string_view separator) {
    std::vector<Setting> settings;
    while (!text.empty()) {
        const size_t end = std::min(text.find('\n'), text.size());
        if (const auto setting = parseSettingLine(text.substr(0, end), separator)) settings.push_back(*setting);
        text.remove_prefix(std::min(end + 1, text.size()));
    }
    return settings;
}

std::optional<std::string_view> findSetting(const std::vector<Setting>& settings, std::string_view key) {
    const auto found =
        std::find_if(settings.begin(), settings.end(), [&](const Setting& setting) { return setting.key == key; });
    if (found == settings.end()) return {};
    return found->value;
}

}  // namespace vexo
