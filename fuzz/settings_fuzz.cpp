// Any settings file, and any file of a change that its writer did not live to make.
#include "check.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"

// The input is the file, and behind a byte 0xFF the value that a key gets.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input = fuzz::text(data, size);
    const std::size_t cut = input.find('\xFF');
    const std::string_view file = input.substr(0, cut);
    const std::string_view value = cut == std::string_view::npos ? "value" : input.substr(cut + 1);
    const auto before = vexo::parseSettings(file, "=");
    if (const auto line = vexo::buildSettingLine("key", value, true)) {
        const std::string changed = vexo::changeSetting(file, "key", *line);
        const auto after = vexo::parseSettings(changed, "=");
        fuzz::require(vexo::findSetting(after, "key") == value);
        for (const vexo::Setting& one : before) {
            if (one.key != "key")
                fuzz::require(vexo::findSetting(after, one.key) == vexo::findSetting(before, one.key));
        }
        const std::string gone = vexo::changeSetting(changed, "key", "");
        fuzz::require(!vexo::findSetting(vexo::parseSettings(gone, "="), "key"));

        const std::string pending = vexo::buildPendingChange(file, changed);
        const auto read = vexo::parsePendingChange(pending);
        fuzz::require(read && read->before == file && read->after == changed);
        fuzz::require(vexo::isOnTheWay(file, *read) && vexo::isOnTheWay(changed, *read));
        fuzz::require(!vexo::parsePendingChange(std::string_view(pending).substr(0, pending.size() / 2)));
    }
    if (const auto change = vexo::parsePendingChange(input)) {
        fuzz::require(vexo::parsePendingChange(vexo::buildPendingChange(change->before, change->after)) == change);
        static_cast<void>(vexo::isOnTheWay(input, *change));
    }
    return 0;
}
