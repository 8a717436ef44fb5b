#include "accounts/user_home.h"

#include <sys/stat.h>

#include <cerrno>
#include <exception>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_store.h"
#include "vexo/settings.h"
#include "vexo/share.h"

namespace vexo {
namespace {

constexpr const char* kSettings = "/etc/vexoinfo.conf";

std::string rootOfHomes() {
    const auto shares = currentShares();
    const ShareDefinition* homes = shares == nullptr ? nullptr : shares->find("homes");
    return homes == nullptr ? std::string() : rootOf(*homes).value_or(std::string());
}

bool isServiceOn() {
    return VLIBCFileCheckKeyValue(kSettings, "userhome_enable", "yes", 1) == 1 && !rootOfHomes().empty();
}

// Writes the home of a user who is known.
int findHome(const std::string& user, char* path, int size) {
    const std::string home = homeOf(user);
    if (home.size() >= static_cast<size_t>(size)) return fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
    struct stat status {};
    if (stat(home.c_str(), &status) != 0) return fail(errorOfErrno(errno));
    if (!S_ISDIR(status.st_mode)) return fail(VEXO_ERR_MISSING, ENOTDIR);
    path[home.copy(path, home.size())] = '\0';
    return 0;
}

}  // namespace

std::string homeOf(const std::string& user) {
    const KeepErrno keep;
    std::string root = rootOfHomes();
    if (root.empty()) return root;
    const AccountName name = splitAccountName(user);
    return root + (name.type == AUTH_DOMAIN ? "/@" + name.domain : "") + '/' + name.name;
}

bool isAboveHomes(std::string_view folder) {
    const KeepErrno keep;
    const std::string root = rootOfHomes();
    if (root.empty()) return false;
    const bool isDomain =
        folder.starts_with(root + "/@") && folder.find('/', root.size() + 1) == std::string_view::npos;
    return isDomain || (root + '/').starts_with(std::string(folder) + '/');
}

}  // namespace vexo

int VEXOServiceUserHomeIsEnabled(int authType, uid_t uid) try {
    VEXO_GATE("VEXOServiceUserHomeIsEnabled", 0);
    // One switch for every kind of account and every user.
    static_cast<void>(authType);
    static_cast<void>(uid);
    const vexo::KeepErrno keep;
    return static_cast<int>(vexo::isServiceOn());
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}

int VEXOServiceHomePathGet(const char* user, char* path, int size) try {
    VEXO_GATE("VEXOServiceHomePathGet", -1);
    if (user == nullptr || path == nullptr || size <= 0) return vexo::fail(VEXO_ERR_PARAMETER);
    path[0] = '\0';
    vexo::Account account;
    const auto known =
        vexo::isAccountName(user) ? vexo::AccountSource::instance().user(user, account) : vexo::Lookup::missing;
    if (known == vexo::Lookup::failed) return vexo::fail(VEXO_ERR_GENERAL);
    if (known == vexo::Lookup::missing) return vexo::fail(VEXO_ERR_USER_MISSING);
    if (!vexo::isServiceOn()) return vexo::fail(VEXO_ERR_MISSING, ENOENT);
    return vexo::findHome(user, path, size);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
