// The home folders of users, seen as paths.
#include <strings.h>
#include <syslog.h>

#include <cerrno>
#include <string>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "core/user_kind.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";
constexpr mode_t kHomeMode = 0755;
constexpr std::string_view kHomesFolder = "/homes";
constexpr std::string_view kHomesPrefix = "/homes/";

[[nodiscard]] bool homeServiceOn(const VEXOUSER& user) {
    return VEXOServiceUserHomeIsEnabled(user.authType, user.uid) == 1;
}

[[nodiscard]] bool makeHome(const VEXOUSER& user, const char** stopAt) {
    return VEXOFSMkdirP(user.szHome, stopAt, 1, user.uid, user.gid, kHomeMode) >= 0;
}

void reportUnmadeHome(const VEXOUSER& user, const char* stopAt) {
    const int failure = errno;
    const std::string home = printable(user.szHome);
    const std::string stop = printable(stopAt);
    errno = failure;
    syslog(LOG_ERR, "%s:%d Fail to mkdir for home [%s]. (stop at %s): %m", kSource, __LINE__, home.c_str(),
           stop.c_str());
}

int homeOf(const std::string& userName, std::string& homePath) {
    UserRecord user;
    if (VEXOUserGet(userName.c_str(), acquire(user)) < 0) {
        syslog(LOG_ERR, "%s:%d Failed to get user (%s)", kSource, __LINE__, printable(userName).c_str());
        OrvLibSetErr(ORV_ERR_USER);
        return 0;
    }
    if (!homeServiceOn(*user)) {
        syslog(LOG_ERR, "%s:%d %d, User home isn't enalbed", kSource, __LINE__, static_cast<int>(user->uid));
        OrvLibSetErr(ORV_ERR_MISSING);
        return 0;
    }
    const char* stopAt = nullptr;
    if (!makeHome(*user, &stopAt)) {
        reportUnmadeHome(*user, stopAt);
        OrvLibSetErr(ORV_ERR_MISSING);
        return 0;
    }
    char resolved[4096];
    if (OrvLibRealFullPathGet(user->szHome, resolved, sizeof resolved - 1) == 0) {
        syslog(LOG_ERR, "%s:%d Failed to get real path (%s)", kSource, __LINE__, printable(user->szHome).c_str());
        return 0;
    }
    homePath = resolved;
    return 1;
}

// Whether `path` is `folder` or lies below it; `folder` compares without case.
[[nodiscard]] bool liesIn(const std::string& path, std::string_view folder) {
    return path.size() >= folder.size() && strncasecmp(path.data(), folder.data(), folder.size()) == 0 &&
           (path.size() == folder.size() || path[folder.size()] == '/');
}

// Where the home of a domain or directory user lies is the platform's business, so its record is asked.
[[nodiscard]] bool liesInForeignHome(const std::string& path, const char* userName) {
    UserRecord user;
    if (VEXOUserGet(userName, acquire(user)) < 0) return false;
    if (homeServiceOn(*user) && !makeHome(*user, nullptr)) return false;  // kept: asking makes the folder
    const std::string_view home = user->szHome;
    const size_t start = home.find(kHomesPrefix);
    return start != std::string_view::npos && liesIn(path, home.substr(start));
}

[[nodiscard]] bool isHome(const std::string& path, const char* userName) {
    if (path == "home" || path == "/home") return true;
    const bool inHomes =
        path.size() >= kHomesFolder.size() && strncasecmp(path.data(), kHomesFolder.data(), kHomesFolder.size()) == 0;
    if (inHomes && userName != nullptr) {
        if (userKindOf(userName) != UserKind::kLocal) return liesInForeignHome(path, userName);
        return liesIn(path, std::string(kHomesPrefix) + userName);
    }
    return path.starts_with("/home/");
}

}  // namespace
}  // namespace orvel

int OrvUserHomeFullPathGet(std::string& homePath, const std::string& userName) {
    return orvel::guarded(0, [&] { return orvel::homeOf(userName, homePath); });
}

bool IsDirUserHome(const std::string& path, const char* userName) {
    return orvel::guardedQuietly(false, [&] { return orvel::isHome(path, userName); });
}
