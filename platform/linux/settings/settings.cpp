#include "vexo/settings.h"

#include <sys/stat.h>

#include <charconv>
#include <map>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "failure.h"
#include "fault_gate.h"
#include "io/trusted_file.h"
#include "settings/appliance_setting.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"
#include "vexo/system_root.h"
#include "vexo/text.h"

namespace {

constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr const char* kDefaults = "/etc.defaults/vexoinfo.conf";
constexpr const char* kSeparator = "=";

struct SettingsFile {
    vexo::FileVersion version;
    std::string text;
    std::vector<vexo::Setting> settings;  // views of `text`
};

// The settings of an appliance file, remembered while the file is unchanged; null with errno when it cannot be read.
// Good until the next call for the same file.
const std::vector<vexo::Setting>* load(const char* file) {
    static auto& files = *new std::map<std::string, SettingsFile>;  // still asked at exit
    const std::string path = VEXO::SystemPath(file);
    SettingsFile& entry = files[path];
    if (entry.version.isCurrentAt(path)) return &entry.settings;
    entry = {};
    vexo::FileVersion version;
    if (!vexo::readSettingsFile(path, entry.text, version)) return nullptr;
    entry.settings = vexo::parseSettings(entry.text, kSeparator);
    entry.version = version;  // last: a reading that memory cut short is not remembered
    return &entry.settings;
}

// What a question without a failure sees: no file, no key.
std::optional<std::string_view> lookUp(const char* file, std::string_view key) {
    const auto* settings = load(file);
    if (settings == nullptr) return {};
    return vexo::findSetting(*settings, key);
}

int copyValue(std::string_view text, char* value, int size) {
    value[text.copy(value, static_cast<size_t>(size) - 1)] = '\0';
    return 1;
}

int addAll(const std::vector<vexo::Setting>& settings, PVLIBCSZHASH* hash) {
    for (const auto& [key, value] : settings) {
        if (VLIBCSzHashSetValue(hash, std::string(key).c_str(), std::string(value).c_str()) < 0) return -1;
    }
    return static_cast<int>(settings.size());
}

}  // namespace

std::optional<std::string> vexo::administratorsGroup() {
    return readSetting("admin_group", "administrators");
}

std::optional<std::string> vexo::readSetting(std::string_view key, std::string_view otherwise) {
    const int before = errno;
    const auto* settings = load(kSettings);
    if (settings == nullptr && errno != ENOENT && errno != ENOTDIR) return std::nullopt;
    errno = before;
    const auto found = settings == nullptr ? std::nullopt : findSetting(*settings, key);
    return std::string(found.value_or(otherwise));
}

int VLIBCFileGetKeyValue(const char* file, const char* key, char* value, int size, int flags) try {
    VEXO_GATE("VLIBCFileGetKeyValue", -1);
    static_cast<void>(flags);
    if (file == nullptr || key == nullptr || value == nullptr || size <= 0) return vexo::fail(VEXO_ERR_PARAMETER);
    value[0] = '\0';
    const auto* settings = load(file);
    if (settings == nullptr) return vexo::fail(vexo::errorOfFile(errno));
    const auto found = vexo::findSetting(*settings, key);
    return found ? copyValue(*found, value, size) : 0;
} catch (const std::bad_alloc&) {
    return vexo::fail(VEXO_ERR_GENERAL);
}

int VLIBCFileCheckKeyValue(const char* file, const char* key, const char* value, int nocase) try {
    VEXO_GATE("VLIBCFileCheckKeyValue", 0);
    if (file == nullptr || key == nullptr || value == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return 0;
    }
    const auto found = lookUp(file, key);
    if (!found) return 0;
    if (nocase == 0) return static_cast<int>(*found == value);
    return static_cast<int>(VLIBCUnicodeUTF8StrCaseCmp(std::string(*found).c_str(), value) == 0);
} catch (const std::bad_alloc&) {
    vexo::fail(VEXO_ERR_GENERAL);
    return 0;
}

int VLIBCFileGetKeys(const char* file, PVLIBCSZHASH* out, const char* sep) try {
    VEXO_GATE("VLIBCFileGetKeys", -1);
    if (file == nullptr || out == nullptr || sep == nullptr || *sep == '\0') return vexo::fail(VEXO_ERR_PARAMETER);
    std::string text;
    vexo::FileVersion version;
    if (!vexo::readSettingsFile(VEXO::SystemPath(file), text, version)) return vexo::fail(vexo::errorOfFile(errno));
    const auto settings = vexo::parseSettings(text, sep);
    if (*out != nullptr) return addAll(settings, out);
    PVLIBCSZHASH made = VLIBCSzHashAlloc(static_cast<int>(settings.size()));
    if (made == nullptr) return -1;
    const int keys = addAll(settings, &made);
    if (keys < 0) {
        VLIBCSzHashFree(made);
    } else {
        *out = made;
    }
    return keys;
} catch (const std::bad_alloc&) {
    return vexo::fail(VEXO_ERR_GENERAL);
}

int VLIBCSupportGet(const char* key) {
    VEXO_GATE("VLIBCSupportGet", 0);
    return VLIBCFileCheckKeyValue(kDefaults, key, "yes", 0);
}

int VLIBCConfGetKTRTimeout() try {
    VEXO_GATE("VLIBCConfGetKTRTimeout", -1);
    const std::string_view text = lookUp(kSettings, "session_timeout").value_or("");
    int minutes = -1;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), minutes);
    return error == std::errc() && end == text.data() + text.size() ? minutes : -1;
} catch (const std::bad_alloc&) {
    return vexo::fail(VEXO_ERR_GENERAL);
}

namespace VexoConf {

std::string Info::Get(const std::string& key, const std::string& def) const {
    VEXO_GATE("VexoConf::Info::Get", def);
    const auto found = lookUp(kSettings, key);
    return found ? std::string(*found) : def;
}

}  // namespace VexoConf
