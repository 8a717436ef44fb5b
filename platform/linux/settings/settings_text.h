// The format of settings files, docs/formats/settings.md. Pure: text in, views of it out.
#ifndef VEXO_LINUX_SETTINGS_TEXT_H
#define VEXO_LINUX_SETTINGS_TEXT_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace vexo {

struct Setting {
    std::string_view key;
    std::string_view value;  // without its quotes
};

// One line without its newline. Empty for a line that is kept but not read: blank, a comment, no separator, no key, or
// with a NUL byte.
std::optional<Setting> parseSettingLine(std::string_view line, std::string_view separator);

// All settings of a file in its order, repeated keys included; the first of a key is the one that counts.
std::vector<Setting> parseSettings(std::string_view text, std::string_view separator);

// The value that counts; empty when there is no such key.
std::optional<std::string_view> findSetting(const std::vector<Setting>& settings, std::string_view key);

// The line of a setting, without its end; empty for a key or a value that would not read back as it is.
std::optional<std::string> buildSettingLine(std::string_view key, std::string_view value, bool quoted);

// `text` with every line of `key` taken out, but with `line`, unless that is empty, in the place of the first of them
// (with its line end), or else as a line of its own at the end. Every other byte stays.
std::string changeSetting(std::string_view text, std::string_view key, std::string_view line);

}  // namespace vexo

#endif
