#include "vexo/language.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <exception>
#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "failure.h"
#include "fault_gate.h"
#include "io/trusted_file.h"
#include "settings/language_choice.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

struct VEXOSTRINGS {
    std::map<std::string, std::string, std::less<>> texts;
};

namespace {

constexpr const char* kTexts = "/usr/vexo/texts/";
constexpr const char* kInstalledTexts = VEXO_DATA_FOLDER "/texts/";

bool isModule(std::string_view name) {
    return !name.empty() && std::all_of(name.begin(), name.end(), [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' || c == '-';
    });
}

// The table of one language: the appliance's own, or else what is installed. False with errno.
bool readTable(const std::string& language, const std::string& module, std::string& text) {
    const std::string name = language + '/' + module + ".conf";
    vexo::FileVersion version;
    if (vexo::readSettingsFile(VEXO::SystemPath(kTexts + name), text, version)) return true;
    return errno == ENOENT && vexo::readSettingsFile(kInstalledTexts + name, text, version);
}

PVEXOSTRINGS open(const std::string& module) {
    std::string text;
    if (!readTable(VexoCgiSelectDefLang(), module, text) &&
        (errno != ENOENT || !readTable(vexo::kEnglish, module, text))) {
        vexo::fail(vexo::errorOfFile(errno));
        return nullptr;
    }
    auto bundle = std::make_unique<VEXOSTRINGS>();
    for (const auto& [key, value] : vexo::parseSettings(text, "=")) bundle->texts.emplace(key, value);
    return bundle.release();
}

}  // namespace

const char* VexoCgiSelectDefLang() try {
    VEXO_GATE("VexoCgiSelectDefLang", vexo::kEnglish);
    const vexo::KeepErrno keep;
    const char* wanted = getenv("HTTP_ACCEPT_LANGUAGE");
    return vexo::chooseLanguage(wanted == nullptr ? "" : wanted, VexoConf::Info().Get("language", ""));
} catch (const std::exception&) {
    return vexo::kEnglish;
}

PVEXOSTRINGS VexoCgiStringBundleOpen(const char* module) try {
    VEXO_GATE("VexoCgiStringBundleOpen", nullptr);
    if (module == nullptr || !isModule(module)) {
        vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
        return nullptr;
    }
    const int before = errno;
    PVEXOSTRINGS bundle = open(module);
    if (bundle != nullptr) errno = before;
    return bundle;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

const char* VexoCgiStringBundleGet(PVEXOSTRINGS bundle, const char* key) {
    VEXO_GATE("VexoCgiStringBundleGet", nullptr);
    if (bundle == nullptr || key == nullptr) return nullptr;
    const auto found = bundle->texts.find(std::string_view(key));
    return found == bundle->texts.end() ? nullptr : found->second.c_str();
}

void VexoCgiStringBundleClose(PVEXOSTRINGS bundle) {
    delete bundle;
}
