#include "accounts/user_home.h"

#include <sys/stat.h>

#include <cerrno>
#include <exception>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "accounts/user_list.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_record.h"
#include "shares/share_store.h"
#include "vexo/settings.h"
#include "vexo/share.h"

namespace vexo {
namespace {

constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr std::string_view kNoHome = "/nonexistent";  // what accounts without a home have

std::string rootOfHomes() {
    const auto shares = currentShares();
    const ShareDefinition* homes = shares == nullptr ? nullptr : shares->find("homes");
    return homes == nullptr ? std::string() : rootOf(*homes).value_or(std::string());
}

// Where homes are in no share, the account source says where they are, and [homes] who has one.
std::string ownHomeOf(const Account& account) {
    const auto shares = currentShares();
    const ShareDefinition* homes = shares == nullptr ? nullptr : shares->homes();
    const bool ofAccount = homes != nullptr && homes->path.find("%H") != std::string::npos;
    if (homes == nullptr || (ofAccount && account.home == kNoHome)) return {};
    const std::optional<std::string> home = homeIn(*homes, account);
    VEXOSHARE* const record = new VEXOSHARE();
    const ShareRecord owner(record);
    if (!home || !fillShare(homesOf(*homes, account.name), *home, *record)) return {};
    ListedUser listed(account.name);
    return listed.rightOn(*record) == 2 && !listed.failed() ? *home : std::string();
}

bool isServiceOn() {
    return VLIBCFileCheckKeyValue(kSettings, "userhome_enable", "yes", 1) == 1;
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
    const std::string root = rootOfHomes();
    if (root.empty()) {
        Account account;
        const bool known = AccountSource::instance().user(user, account) == Lookup::found;
        return known ? ownHomeOf(account) : std::string();
    }
    const AccountName name = splitAccountName(user);
    return root + (name.type == AUTH_DOMAIN ? "/@" + name.domain : "") + '/' + name.name;
}

bool isAboveHomes(std::string_view folder, uid_t user) {
    const KeepErrno keep;
    const std::string root = rootOfHomes();
    if (root.empty()) {
        Account account;
        const bool known = AccountSource::instance().user(user, account) == Lookup::found;
        return known && ownHomeOf(account).starts_with(std::string(folder) + '/');
    }
    const bool isDomain =
        folder.starts_with(root + "/@") && folder.find('/', root.size() + 1) == std::string_view::npos;
    return isDomain || (root + '/').starts_with(std::string(folder) + '/');
}

}  // namespace vexo

int VEXOServiceUserHomeIsEnabled(int authType, uid_t uid) try {
    VEXO_GATE("VEXOServiceUserHomeIsEnabled", 0);
    static_cast<void>(authType);  // one switch for every kind of account
    const vexo::KeepErrno keep;
    if (!vexo::isServiceOn()) return 0;
    if (!vexo::rootOfHomes().empty()) return 1;
    vexo::Account account;
    const bool known = vexo::AccountSource::instance().user(uid, account) == vexo::Lookup::found;
    return static_cast<int>(known && !vexo::ownHomeOf(account).empty());
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
    if (!vexo::isServiceOn() || vexo::homeOf(user).empty()) return vexo::fail(VEXO_ERR_MISSING, ENOENT);
    return vexo::findHome(user, path, size);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
