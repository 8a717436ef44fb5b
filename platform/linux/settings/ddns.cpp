#include "vexo/ddns.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>
#include <string>
#include <string_view>

#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "settings/settings_text.h"
#include "vexo/system_root.h"

namespace {

constexpr size_t kLimit = size_t{1} << 20;

// The lines of the section [provider], "" without: from behind its header to the next header.
std::string_view sectionOf(std::string_view text, std::string_view provider) {
    const std::string header = "[" + std::string(provider) + "]";
    bool inside = false;
    size_t begin = 0;
    for (size_t at = 0; at < text.size();) {
        const size_t newline = std::min(text.find('\n', at), text.size());
        std::string_view line = text.substr(at, newline - at);
        if (line.ends_with('\r')) line.remove_suffix(1);
        if (line.starts_with('[')) {
            if (inside) return text.substr(begin, at - begin);
            inside = line == header;
            begin = std::min(newline + 1, text.size());
        }
        at = newline + 1;
    }
    return inside ? text.substr(begin) : std::string_view();
}

// What may stand between the scheme and the port of a link.
bool isHostName(std::string_view host) {
    constexpr std::string_view allowed = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789.-_";
    return !host.empty() && host.size() < sizeof(VEXODDNS::szHostname) &&
           host.find_first_not_of(allowed) == std::string_view::npos;
}

}  // namespace

int VEXODDNSConfigGet(const char* provider, VEXODDNS* entry) try {
    if (entry != nullptr) *entry = {};
    VEXO_GATE("VEXODDNSConfigGet", -1);
    if (provider == nullptr || entry == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    std::string text;
    vexo::FileVersion version;
    if (!vexo::readRegularFile(VEXO::SystemPath("/etc/vexo/ddns.conf"), kLimit, text, version)) {
        return vexo::fail(VEXO_ERR_FILE);
    }
    const std::string_view name = provider;
    const auto settings = vexo::parseSettings(sectionOf(text, name), "=");
    const auto host = vexo::findSetting(settings, "hostname");
    if (!host || !isHostName(*host) || name.size() >= sizeof entry->szProvider) {
        return vexo::fail(VEXO_ERR_MISSING, ENOENT);
    }
    memcpy(entry->szProvider, name.data(), name.size());
    memcpy(entry->szHostname, host->data(), host->size());
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
