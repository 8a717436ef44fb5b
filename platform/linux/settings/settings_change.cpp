// Changing settings files.
#include <cerrno>
#include <exception>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "failure.h"
#include "fault_gate.h"
#include "io/trusted_file.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace {

// The two ways in which a line may be written, by what callers hand over; empty for any other.
std::optional<bool> isQuoted(const char* format) {
    const std::string_view text = format == nullptr ? "%s=\"%s\"\n" : format;
    if (text == "%s=\"%s\"\n") return true;
    if (text == "%s=%s\n") return false;
    return {};
}

int change(const char* file, bool create, const std::function<std::string(std::string_view)>& edit) {
    const int before = errno;
    if (!vexo::changeSettingsFile(VEXO::SystemPath(file), create, edit)) return vexo::fail(vexo::errorOfFile(errno));
    errno = before;
    return 0;
}

}  // namespace

int VLIBCFileSetKeyValue(const char* file, const char* key, const char* value, const char* format) try {
    VEXO_GATE("VLIBCFileSetKeyValue", -1);
    if (file == nullptr || key == nullptr || value == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const auto quoted = isQuoted(format);
    const auto line = quoted ? vexo::buildSettingLine(key, value, *quoted) : std::nullopt;
    if (!line) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    return change(file, true, [&](std::string_view text) { return vexo::changeSetting(text, key, *line); });
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VLIBCFileRemoveKey(const char* file, const char* key) try {
    VEXO_GATE("VLIBCFileRemoveKey", -1);
    if (file == nullptr || key == nullptr || *key == '\0') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    if (change(file, false, [&](std::string_view text) { return vexo::changeSetting(text, key, {}); }) == 0) return 0;
    if (errno != ENOENT) return -1;
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
