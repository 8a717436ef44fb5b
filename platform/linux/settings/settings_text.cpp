#include "settings/settings_text.h"

#include <algorithm>

namespace vexo {
namespace {

std::string_view trim(std::string_view text) {
    const size_t first = text.find_first_not_of(" \t\r");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t\r") - first + 1);
}

// Takes the next line off `text`, its end included.
std::string_view takeLine(std::string_view& text) {
    const size_t newline = text.find('\n');
    const std::string_view line = text.substr(0, newline == std::string_view::npos ? newline : newline + 1);
    text.remove_prefix(line.size());
    return line;
}

// "\r\n", "\n" or nothing.
std::string_view endOf(std::string_view line) {
    return line.substr(line.size() - (line.ends_with("\r\n") ? 2 : line.ends_with('\n') ? 1 : 0));
}

std::string_view withoutEnd(std::string_view line) {
    return line.substr(0, line.size() - endOf(line).size());
}

bool isPlain(std::string_view text) {
    return std::all_of(text.begin(), text.end(),
                       [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F && byte != '"'; });
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
        if (const auto setting = parseSettingLine(withoutEnd(takeLine(text)), separator)) settings.push_back(*setting);
    }
    return settings;
}

std::optional<std::string_view> findSetting(const std::vector<Setting>& settings, std::string_view key) {
    const auto found =
        std::find_if(settings.begin(), settings.end(), [&](const Setting& setting) { return setting.key == key; });
    if (found == settings.end()) return {};
    return found->value;
}

std::optional<std::string> buildSettingLine(std::string_view key, std::string_view value, bool quoted) {
    if (!isPlain(key) || !isPlain(value)) return {};
    const std::string_view quote = quoted ? "\"" : "";
    std::string line(key);
    line.append("=").append(quote).append(value).append(quote);
    const auto readBack = parseSettingLine(line, "=");
    if (!readBack || readBack->key != key || readBack->value != value) return {};
    return line;
}

std::string changeSetting(std::string_view text, std::string_view key, std::string_view line) {
    std::string changed;
    changed.reserve(text.size() + line.size() + 2);
    while (!text.empty()) {
        const std::string_view old = takeLine(text);
        const auto setting = parseSettingLine(withoutEnd(old), "=");
        if (!setting || setting->key != key) {
            changed.append(old);
        } else if (!line.empty()) {
            changed.append(line).append(endOf(old).empty() ? "\n" : endOf(old));
            line = {};
        }
    }
    if (line.empty()) return changed;
    if (!changed.empty() && !changed.ends_with('\n')) changed += '\n';
    return changed.append(line) + '\n';
}

}  // namespace vexo
