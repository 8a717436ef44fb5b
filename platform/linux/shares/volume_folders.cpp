#include <sys/stat.h>

#include <cerrno>
#include <exception>
#include <set>
#include <string>
#include <utility>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "accounts/user_home.h"
#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "filesystem/owner.h"
#include "io/file_io.h"
#include "shares/share_store.h"
#include "vexo/filesystem.h"
#include "vexo/volume.h"

namespace vexo {
namespace {

constexpr mode_t kEverybodys = 01777;
constexpr mode_t kOwn = 0700;
constexpr const char* kFolders[] = {"@tmp", "orvel", "PXSearch"};

std::string volumeOf(const std::string& root) {
    return root.substr(0, root.find('/', 1));
}

// Roots that differ from user to user count as far as they do not.
std::set<std::string> commonVolumes(const ShareTable& shares) {
    std::set<std::string> volumes;
    for (const ShareDefinition& share : shares.all()) {
        const std::string volume = volumeOf(share.path);
        if (!hasVariables(volume)) volumes.insert(volume);
    }
    return volumes;
}

std::set<std::string> volumesOf(const ShareTable& shares, const Account& account) {
    std::set<std::string> volumes;
    for (const ShareDefinition& share : shares.all()) {
        if (const auto root = rootFor(share, account)) volumes.insert(volumeOf(*root));
    }
    const std::string home = homeOf(account.name);
    if (!home.empty()) volumes.insert(volumeOf(home));
    return volumes;
}

// The server of a network mount may be dead, or know no root: who first needs the folders there makes them.
void leaveOutNetworkMounts(std::set<std::string>& volumes) {
    std::erase_if(volumes,
                  [](const std::string& volume) { return VEXOFSIsRemoteFS(VEXOGetFSType(volume.c_str(), 0)) == 1; });
}

// Opens the folder `name` in `parent`, made where it is missing, and sees to its owner and mode. What is root's is
// handed over, as a killed process may have left it or the library made it. Empty with errno.
Descriptor openOwned(const Descriptor& parent, const char* name, uid_t owner, gid_t group, mode_t mode) {
    Descriptor folder = openFile(parent.get(), name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    if (!folder && errno == ENOENT) {
        if (mkdirat(parent.get(), name, 0700) != 0 && errno != EEXIST) return Descriptor();
        folder = openFile(parent.get(), name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    }
    struct stat status {};
    if (!folder || fstat(folder.get(), &status) != 0) return Descriptor();
    if (status.st_uid != 0 && status.st_uid != owner) {
        errno = EEXIST;
        return Descriptor();
    }
    const bool owned = owner == status.st_uid || setOwner(folder.get(), owner, group);
    const bool right = owned && ((status.st_mode & 07777) == mode || setMode(folder.get(), mode));
    return right ? std::move(folder) : Descriptor();
}

class Preparation {
 public:
    Preparation(void (*take)(const VEXOVOLUMENOTE*, void*), void* argument) : take_(take), argument_(argument) {}

    // `account`: whose folder is wanted, too; null for none's.
    void prepare(const std::string& volume, const Account* account) {
        std::string at = volume;
        const int error = make(volume, account, at);
        const VEXOVOLUMENOTE note = {volume.c_str(), error, error == 0 ? "" : at.c_str()};
        if (take_ != nullptr) take_(&note, argument_);
        if (error != 0) error_ = error;
    }
    [[nodiscard]] int error() const { return error_; }

 private:
    // errno; `at` is the folder that it is about.
    static int make(const std::string& volume, const Account* account, std::string& at) {
        Descriptor folder = openFile(volume, O_PATH | O_DIRECTORY);
        if (!folder) return errno;
        for (const char* name : kFolders) {
            at += std::string("/") + name;
            folder = openOwned(folder, name, 0, 0, kEverybodys);
            if (!folder) return errno;
        }
        if (account == nullptr) return 0;
        at += "/" + account->name;
        return openOwned(folder, account->name.c_str(), account->uid, account->gid, kOwn) ? 0 : errno;
    }

    void (*take_)(const VEXOVOLUMENOTE*, void*);
    void* argument_;
    int error_ = 0;
};

int prepareAll(std::set<std::string> volumes, const Account* account, Preparation preparation) {
    const orvel::RaisedIdentity raised;
    if (geteuid() != 0) return fail(VEXO_ERR_DENIED, EPERM);
    leaveOutNetworkMounts(volumes);
    for (const std::string& volume : volumes) preparation.prepare(volume, account);
    return preparation.error() == 0 ? 0 : fail(errorOfErrno(preparation.error()), preparation.error());
}

}  // namespace
}  // namespace vexo

int VEXOVolumesPrepare(void (*take)(const VEXOVOLUMENOTE*, void*), void* argument) try {
    VEXO_GATE("VEXOVolumesPrepare", -1);
    const auto shares = vexo::currentShares();
    if (shares == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    return vexo::prepareAll(vexo::commonVolumes(*shares), nullptr, {take, argument});
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOVolumesPrepareFor(const char* user, void (*take)(const VEXOVOLUMENOTE*, void*), void* argument) try {
    VEXO_GATE("VEXOVolumesPrepareFor", -1);
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    vexo::Account account;
    const bool valid = vexo::isAccountName(user);
    const auto known = valid ? vexo::AccountSource::instance().user(user, account) : vexo::Lookup::missing;
    if (known == vexo::Lookup::missing) return vexo::fail(VEXO_ERR_USER_MISSING, ENOENT);
    const auto shares = vexo::currentShares();
    if (known == vexo::Lookup::failed || shares == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    return vexo::prepareAll(vexo::volumesOf(*shares, account), &account, {take, argument});
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
