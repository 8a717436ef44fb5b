#include "orvel/sharing_link.h"

#include <syslog.h>

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <optional>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/user_kind.h"
#include "sharing/client_address.h"
#include "sharing/link_lookup.h"
#include "sharing/login_add.h"
#include "vexo/auto_block.h"
#include "vexo/error.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvellogin";
constexpr std::size_t kAddressSize = 64;
constexpr std::size_t kUserSize = 64;
constexpr std::size_t kCookieSize = 67;
constexpr int kEverything = 15;

enum Answer : int { kLoggedIn = 1, kRefused = -3, kFailed = -4, kNoCookie = -5 };

// The link identifier of a request; none when neither place is there.
std::optional<std::string> linkOf(const VEXO::WebCGI& cgi) {
    const char* header = getenv("HTTP_FOLDER_SHARING");
    if (header != nullptr) return header;
    if (!cgi.HasParam("FOLDER_SHARING")) return std::nullopt;
    return cgi.GetParam("FOLDER_SHARING", "");
}

bool isAdministrator(const char* user) {
    const int member = VEXOGroupIsAdminGroupMemEx(user, 1);
    if (member < 0 && VLIBCErrGet() != VEXO_ERR_USER_MISSING) {
        // Kept: the text names the function without its ending.
        syslog(LOG_ERR, "%s:%d VEXOGroupIsAdminGroupMem(%s) failed. [0x%04X %s:%d]", kSource, __LINE__,
               printable(user).c_str(), static_cast<unsigned>(VLIBCErrGet()), VLIBCErrorGetFile(), VLIBCErrorGetLine());
    }
    return member > 0;
}

// The bits of the allowed kinds that an account needs.
int neededKinds(UserKind kind, bool administrator) {
    int needed = administrator ? ORV_LOGIN_ADMINISTRATOR : 0;
    if (kind == UserKind::kDomain) return needed | ORV_LOGIN_DOMAIN;
    if (kind == UserKind::kDirectory) return needed | ORV_LOGIN_DIRECTORY;
    return administrator ? needed : ORV_LOGIN_LOCAL;
}

int login(VEXO::WebCGI* cgi, char* session, int size, const _tag_login_params* params, const char* link) {
    if (cgi == nullptr || params == nullptr || params->user == nullptr || params->password == nullptr) {
        syslog(LOG_ERR, "%s (%d) Bad parameter.", kSource, __LINE__);
        return kFailed;
    }
    char address[kAddressSize];
    if (GetClientIP(address, sizeof address) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to get client ip.", kSource, __LINE__);
        return kFailed;
    }
    if (VexoCgiIsDeniedIP(address) == 1) {
        syslog(LOG_ERR, "%s:%d VEXOAutoBlockIsDeniedIP", kSource, __LINE__);
        return kRefused;
    }
    const int needed = neededKinds(userKindOf(params->user), isAdministrator(params->user));
    if ((params->allowedKinds & needed) != needed) {
        syslog(LOG_ERR, "%s:%d LOGIN_ERR_INVALID", kSource, __LINE__);
        return kRefused;
    }
    const char* linkId = link == nullptr ? "" : link;
    std::string cookie;
    if (!addLoginRecord(params->user, cookie, params->neverExpires, linkId)) {
        syslog(LOG_ERR, "%s (%d) VexoCgiLoginAddUser failed.", kSource, __LINE__);
        return kFailed;
    }
    cookie.resize(std::min(cookie.size(), kCookieSize - 1));
    VEXOAutoBlockResetByIP(address);
    if (session != nullptr && size > 0) snprintf(session, static_cast<std::size_t>(size), "%s", cookie.c_str());
    if (!cgi->AddCookieToHeader("/", linkId, cookie)) {
        syslog(LOG_ERR, "%s (%d) AddCookieToHeader failed.", kSource, __LINE__);
    }
    return kLoggedIn;
}

}  // namespace
}  // namespace orvel

namespace OrvelLogin {

using orvel::guardedQuietly;

std::string FolderSharingLoginManager::GetSharingFolderPath(VEXO::WebCGI& cgi) const {
    return guardedQuietly(std::string(), [&] {
        const auto link = orvel::linkOf(cgi);
        return link ? orvel::sharedPathOf(*link) : std::string();
    });
}

int FolderSharingLoginManager::isAuthorized(VEXO::WebCGI* cgi, char* user, int size, _tag_confirm_policy* policy,
                                            _tag_cgi_position position, const char* cookieName) {
    return guardedQuietly(static_cast<int>(orvel::kFailed), [&] {
        if (cgi == nullptr) return static_cast<int>(orvel::kFailed);
        const std::string session = cookieName == nullptr ? "" : cgi->GetCookie(cookieName, "");
        if (session.empty()) return static_cast<int>(orvel::kNoCookie);
        const int answer = IsAuthorizedByPath(cgi, session.c_str(), user, size, policy, position, cookieName);
        if (user != nullptr && size > 0) loginUser_ = user;
        return answer;
    });
}

bool FolderSharingLoginManager::isAuthorized(VEXO::WebCGI& cgi, const std::string& link) {
    char user[orvel::kUserSize] = {};
    _tag_confirm_policy policy = {.flags = orvel::kEverything, .keepAccessTime = 0};
    return isAuthorized(&cgi, user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, link.c_str()) > 0;
}

bool FolderSharingLoginManager::isAuthorized(VEXO::WebCGI& cgi) {
    return guardedQuietly(false, [&] {
        const auto link = orvel::linkOf(cgi);
        return link && isAuthorized(cgi, *link);
    });
}

bool FolderSharingLoginManager::folderSharingLogin(VEXO::WebCGI& cgi, const std::string& link,
                                                   const std::string& owner) {
    return guardedQuietly(false, [&] {
        if (isAuthorized(cgi, link)) return true;
        char session[orvel::kCookieSize] = {};
        _tag_login_params params = {.user = owner.c_str(),
                                    .password = "unused",
                                    .service = "folderSharing",
                                    .allowedKinds = orvel::kEverything,
                                    .neverExpires = 0};
        if (login(&cgi, session, sizeof session, &params, link.c_str()) != orvel::kLoggedIn) return false;
        loginUser_ = owner;
        return true;
    });
}

int FolderSharingLoginManager::login(VEXO::WebCGI* cgi, char* session, int size, _tag_login_params* params,
                                     const char* link) {
    return guardedQuietly(static_cast<int>(orvel::kFailed),
                          [&] { return orvel::login(cgi, session, size, params, link); });
}

void FolderSharingLoginManager::folderSharingFailLoginSet() {
    char address[orvel::kAddressSize];
    if (orvel::GetClientIP(address, sizeof address) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to get client ip.", orvel::kSource, __LINE__);
        return;
    }
    AutoBlockFailLoginSet(address, "FOLDER_SHARING");
}

std::string FolderSharingLoginManager::GetLoginUserName() const {
    return guardedQuietly(std::string(), [&] { return loginUser_; });
}

}  // namespace OrvelLogin
