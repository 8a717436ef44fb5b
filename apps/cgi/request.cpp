#include "request.h"

#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <memory>

#include "base/owner.h"
#include "client_address.h"
#include "orvel/error_state.h"
#include "orvel/identity.h"
#include "orvel/share_path.h"
#include "orvel/upload_check.h"
#include "text.h"
#include "vexo/filesystem.h"
#include "vexo/session.h"
#include "vexo/settings.h"
#include "vexo/share.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr const char* kApplication = "VEXO.QDS.App.Quorvane3.Instance";

std::vector<std::string> trustedProxies() {
    const std::string setting = VexoConf::Info().Get("trusted_proxies", "");
    std::vector<std::string> proxies;
    for (const std::string& proxy : WebUtils::StringExplode(setting, ",")) {
        const size_t first = std::min(proxy.find_first_not_of(' '), proxy.size());
        const std::string address = canonicalAddress(proxy.substr(first, proxy.find_last_not_of(' ') + 1 - first));
        if (!address.empty()) proxies.push_back(address);
    }
    return proxies;
}

// What goes wrong here shows again, with its code, when the path is resolved.
void makeHome(const std::string& user) {
    std::unique_ptr<VEXOUSER, Releaser<VEXOUserFree>> record;
    if (VEXOUserGet(user.c_str(), acquire(record)) < 0) return;
    std::string home;
    if (VEXOServiceUserHomeIsEnabled(record->authType, record->uid) == 1) OrvUserHomeFullPathGet(home, user);
}

// Appends the paths of a list; see pathParams. False when a line cannot be one.
bool addList(const std::vector<std::string>& lines, std::vector<std::string>& paths) {
    for (const std::string& line : lines) {
        const auto path = percentDecode(line);
        const bool whole = line.find('/') != std::string::npos;
        if (!path || (!whole && paths.empty())) return false;
        paths.push_back(whole ? *path : paths.back().substr(0, paths.back().rfind('/') + 1) + *path);
    }
    return true;
}

}  // namespace

void settleClientAddress() {
    const char* forwarded = getenv("HTTP_X_FORWARDED_FOR");
    const char* client = getenv("HTTP_CLIENT_IP");
    const char* scheme = getenv("HTTP_X_FORWARDED_PROTO");
    if (forwarded == nullptr && client == nullptr && scheme == nullptr) return;
    const char* asked = getenv("REMOTE_ADDR");
    const std::string peer = asked == nullptr ? "" : canonicalAddress(asked);
    const std::vector<std::string> proxies = trustedProxies();
    const bool trusted = std::find(proxies.begin(), proxies.end(), peer) != proxies.end();
    std::string address;
    if (trusted && forwarded != nullptr) address = clientBehind(forwarded, peer, proxies);
    if (trusted && forwarded == nullptr && client != nullptr) address = canonicalAddress(client);
    if (trusted && scheme != nullptr && std::string_view(scheme) == "https") setenv("HTTPS", "on", 1);
    unsetenv("HTTP_CLIENT_IP");
    unsetenv("HTTP_X_FORWARDED_FOR");
    if (!address.empty()) setenv("HTTP_X_FORWARDED_FOR", address.c_str(), 1);
}

std::string clientAddress() {
    for (const char* name : {"HTTP_X_FORWARDED_FOR", "REMOTE_ADDR"}) {
        if (const char* value = getenv(name)) return value;
    }
    return "";
}

bool isForeign() {
    const char* origin = getenv("HTTP_ORIGIN");
    const char* host = getenv("HTTP_HOST");
    if (origin == nullptr || host == nullptr) return false;
    const std::string_view from = origin;
    const size_t scheme = from.find("://");
    return scheme == std::string_view::npos || from.substr(scheme + 3) != host;
}

bool isMeantForAnother(const std::string& user) {
    const char* meant = getenv("HTTP_ORVEL_USER");
    return meant != nullptr && percentDecode(meant) != readable(user);
}

Status admit(User& user) {
    WebMan session;
    const bool authorized = IsAuthorized(session, kApplication);
    user.name = session.GetLoginUserName();
    user.sid = session.GetSessionId();
    user.cookie = session.GetNewCookie();
    if (authorized) return isMeantForAnother(user.name) ? Status::kNotLoggedIn : Status::kOk;
    return user.name.empty() ? Status::kNotLoggedIn : Status::kForbidden;
}

bool begin(Output& out, User& user) {
    settleClientAddress();
    const Status admitted = isForeign() ? Status::kForbidden : admit(user);
    if (admitted != Status::kOk) replyFailure(out, admitted, "", ORV_ERR_DENIED, "");
    return admitted == Status::kOk;
}

int actAs(const char* sid, const std::string& user, bool needsHome) {
    if (needsHome) makeHome(user);
    OrvLibSetErr(ORV_ERR_NONE);
    if (OrvLibUGIDSet(sid, user.c_str()) != 0) return lastCode();
    // A switch that the kernel refused, or refused in part, reports success, too.
    return VEXOUserOwnsProcess(user.c_str()) == 1 ? ORV_ERR_NONE : ORV_ERR_GENERAL;
}

Status statusOf(int code) {
    return code == ORV_ERR_PARAMETER ? Status::kBadRequest : Status::kOk;
}

std::optional<unsigned long> parseNumber(std::string_view text) {
    unsigned long number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return number;
}

std::optional<unsigned long> numberParam(const VEXO::WebCGI& cgi, const char* name, unsigned long fallback) {
    if (!cgi.HasParam(name)) return fallback;
    return parseNumber(cgi.GetParam(name, ""));
}

bool isPosted() {
    const char* method = getenv("REQUEST_METHOD");
    return method != nullptr && std::string_view(method) == "POST";
}

std::optional<_tag_dir_entry_type_> typeParam(const VEXO::WebCGI& cgi) {
    const std::string word = cgi.GetParam("filetype", "all");
    if (word == "dir") return DIR_ENTRY_TYPE_DIR;
    if (word == "file") return DIR_ENTRY_TYPE_FILE;
    if (word == "all") return DIR_ENTRY_TYPE_ALL;
    return std::nullopt;
}

std::optional<bool> ascendingParam(const VEXO::WebCGI& cgi) {
    const std::string word = cgi.GetParam("sort_direction", "asc");
    if (word == "asc") return true;
    if (word == "desc") return false;
    return std::nullopt;
}

std::vector<std::string> linesParam(const VEXO::WebCGI& cgi, const char* name) {
    std::vector<std::string> lines = WebUtils::StringExplode(cgi.GetParam(name, ""), "\n");
    for (std::string& line : lines) {
        if (line.ends_with('\r')) line.pop_back();
    }
    std::erase(lines, "");
    return lines;
}

std::optional<std::vector<std::string>> pathParams(const VEXO::WebCGI& cgi) {
    std::vector<std::string> paths;
    if (!addList(linesParam(cgi, "paths_raw"), paths)) return std::nullopt;
    for (const std::string& raw : cgi.GetParams("path_raw")) {
        const auto path = percentDecode(raw);
        if (!path) return std::nullopt;
        paths.push_back(*path);
    }
    for (const std::string& path : cgi.GetParams("path")) {
        if (path.find('\0') != std::string::npos) return std::nullopt;
        paths.push_back(path);
    }
    return paths;
}

std::optional<std::string> bytesParam(const VEXO::WebCGI& cgi, const std::string& name) {
    const std::string raw = name + "_raw";
    if (cgi.HasParam(raw)) return percentDecode(cgi.GetParam(raw, ""));
    std::string text = cgi.GetParam(name, "");
    if (text.find('\0') != std::string::npos) return std::nullopt;
    return text;
}

std::optional<std::string> pathParam(const VEXO::WebCGI& cgi) {
    return bytesParam(cgi, "path");
}

}  // namespace orvel::cgi
