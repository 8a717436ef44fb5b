#include "orvel/external_host.h"

#include <strings.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "util/host_header.h"
#include "vexo/ddns.h"
#include "vexo/error.h"
#include "vexo/settings.h"

namespace {

constexpr const char* kSource = "orvelmisc";
constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr const char* kDefaults = "/etc.defaults/vexoinfo.conf";
constexpr std::size_t kLongest = 4095;

// Reads a setting, cut to size - 1 characters, into `value` ("" when there is none). False when the read failed.
template <int size>
bool readSetting(const char* key, std::string& value) {
    char buffer[size] = {};
    const bool ok = VLIBCFileGetKeyValue(kSettings, key, buffer, size, 0) >= 0;
    value = ok ? buffer : "";
    return ok;
}

bool isSecure() {
    const char* https = getenv("HTTPS");
    return https != nullptr && strcasecmp(https, "on") == 0;
}

// The name at the chosen dynamic-DNS provider, or "" when none can be used.
std::string dynamicName() {
    if (VLIBCFileCheckKeyValue(kDefaults, "supportddns", "yes", 0) == 0) return "";
    std::string update;
    if (!readSetting<8>("ddns_update", update)) {
        syslog(LOG_ERR, "%s:%d Failed to get ddns_update of /etc/vexoinfo.conf", kSource, __LINE__);
    }
    if (strcasecmp(update.c_str(), "yes") != 0) return "";
    std::string provider;
    if (!readSetting<128>("ddns_select", provider)) {
        syslog(LOG_ERR, "%s:%d Failed to get ddns_select of /etc/vexoinfo.conf", kSource, __LINE__);
    }
    if (provider.empty()) return "";
    VEXODDNS config{};
    if (VEXODDNSConfigGet(provider.c_str(), &config) < 0) {
        const int err = errno;
        syslog(LOG_ERR, "%s:%d Failed to get DDNS info by select name %s, errno=%s, vexo_error=[%X]", kSource, __LINE__,
               orvel::printable(provider).c_str(), strerror(err), static_cast<unsigned>(VLIBCErrGet()));
        return "";
    }
    return config.szHostname;
}

std::string externalHost(const orvel::HostAndPort& request) {
    std::string host;
    readSetting<4096>("external_host_ip", host);
    if (host.empty()) host = dynamicName();
    return host.empty() ? request.host : host;
}

std::string baseAddress() {
    const orvel::HostAndPort request = orvel::splitHostHeader(getenv("HTTP_HOST"));
    const bool secure = isSecure();
    std::string port;
    readSetting<16>(secure ? "external_port_ktr_https" : "external_port_ktr_http", port);
    if (port.empty()) port = request.port;
    std::string address = (secure ? "https://" : "http://") + externalHost(request);
    if (!port.empty()) address += ":" + port;
    return address;
}

}  // namespace

namespace orvel {

HostAndPort splitHostHeader(const char* text) {
    if (text == nullptr) return {};
    const std::string_view all = text;
    std::size_t end = all.find_first_of(":/");
    if (all.starts_with('[')) {
        const std::size_t bracket = all.find(']');
        end = bracket == std::string_view::npos ? bracket : bracket + 1;
    }
    HostAndPort result{std::string(all.substr(0, std::min(end, kLongest))), ""};
    if (end < all.size() && all[end] == ':') {
        const std::string_view rest = all.substr(end + 1);
        result.port = rest.substr(0, std::min(rest.find('/'), kLongest));
    }
    return result;
}

}  // namespace orvel

std::string& GetRemoteAddr(std::string& address) {
    orvel::guardedQuietly(0, [&] {
        address.clear();
        address = baseAddress();
        return 0;
    });
    return address;
}
