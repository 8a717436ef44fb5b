#include "orvel/sharing_settings.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>

#include "base/file.h"
#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "vexo/error.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelsharing";
constexpr const char* kFile = "/usr/vexo/etc/vexosharing.conf";
constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr const char* kApplication = "VEXO.QDS.App.Quorvane3.Instance";
constexpr const char* kGranted = "true";
constexpr int kCapacity = 2048;

// The per-user file, open and locked until the end of its life; made when missing.
class LockedFile {
 public:
    LockedFile() : path_(VEXO::SystemPath(kFile)) {
        do {
            file_ = openFile(path_, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY, 0644);
        } while (file_ && isReplaced());
        // First of all: the platform changes no file that others than its owner may write.
        if (file_) static_cast<void>(makeReadable());
    }
    // By name, not by closing alone: a forked child may hold the descriptor too.
    ~LockedFile() {
        if (file_) flock(file_.get(), LOCK_UN);
    }
    LockedFile(const LockedFile&) = delete;
    LockedFile& operator=(const LockedFile&) = delete;
    explicit operator bool() const { return static_cast<bool>(file_); }
    [[nodiscard]] bool makeReadable() const { return fchmod(file_.get(), 0644) == 0; }

 private:
    // Waits for the lock; whether the file was replaced meanwhile. Where that cannot be determined it is closed, since
    // another process may hold the lock of the one that counts. A lock that the file system refuses is no failure
    // (kept).
    [[nodiscard]] bool isReplaced() {
        static_cast<void>(lockFile(file_.get(), LOCK_EX));
        struct stat locked = {}, current = {};
        if (fstat(file_.get(), &locked) == 0 && lstat(path_.c_str(), &current) == 0) {
            return !isSameFile(locked, current);
        }
        if (errno == ENOENT) return true;
        file_.reset();
        return false;
    }

    std::string path_;
    Descriptor file_;
};

// The key of a user: his id in decimal. False, logged, for a user who is not known.
bool keyOf(const std::string& userName, std::string& key) {
    uid_t uid = 0;
    gid_t gid = 0;
    if (VEXOUserGetUGID(userName.c_str(), &uid, &gid) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to get GID for user=%s", kSource, __LINE__, printable(userName).c_str());
        return false;
    }
    key = std::to_string(uid);
    return true;
}

bool hasPrivilege(const std::string& userName) {
    std::string key;
    if (!keyOf(userName, key)) return false;
    char value[8] = {};
    const int found = VLIBCFileGetKeyValue(kFile, key.c_str(), value, sizeof value, 0);
    if (found < 0 && VLIBCErrGet() != VEXO_ERR_FILE) {
        syslog(LOG_ERR, "%s:%d VLIBCFileGetKeyValue failed", kSource, __LINE__);
    }
    return found > 0 && std::string(value) == kGranted;
}

bool applyChoice(const std::string& userName, const std::string& value) {
    std::string key;
    if (!keyOf(userName, key)) return false;
    if (value != kGranted) return VLIBCFileRemoveKey(kFile, key.c_str()) == 0;
    if (VLIBCFileSetKeyValue(kFile, key.c_str(), kGranted, "%s=\"%s\"\n") == 0) return true;
    syslog(LOG_ERR, "%s:%d ApplyData: Failed to set %s", kSource, __LINE__, printable(userName).c_str());
    return false;
}

bool setPrivileges(const std::map<std::string, std::string>& values) {
    const LockedFile file;
    if (!file) {
        syslog(LOG_ERR, "%s:%d Failed to fdLock", kSource, __LINE__);
        return false;
    }
    bool applied = true;
    for (const auto& [userName, value] : values) {
        if (!userName.empty() && !applyChoice(userName, value)) applied = false;
    }
    if (!file.makeReadable()) {
        syslog(LOG_ERR, "%s:%d chmod failed. filepath:[%s]", kSource, __LINE__, kFile);
    }
    return applied;
}

bool removePrivilege(const std::string& key) {
    const LockedFile file;
    if (!file) {
        syslog(LOG_ERR, "%s:%d Failed to fdLock", kSource, __LINE__);
        return false;
    }
    return VLIBCFileRemoveKey(kFile, key.c_str()) != -1;
}

// Reads every pair of the file and lists its keys; false when there are no pairs; logged, except for a missing file.
bool readChoices(StringHash& choices, StringList& keys) {
    const int count = VLIBCFileGetKeys(kFile, lend(choices), "=");
    if (count < 0 && VLIBCErrGet() != VEXO_ERR_FILE) {
        syslog(LOG_ERR, "%s:%d VLIBCFileGetKeys() failed!! szFile=[%s], vexoerr=[0x%04X]", kSource, __LINE__, kFile,
               static_cast<unsigned>(VLIBCErrGet()));
    }
    if (count <= 0) return false;
    if (VLIBCSzHashEnumKey(choices.get(), lend(keys)) < 0) {
        syslog(LOG_ERR, "%s(%d)VLIBCSzHashEnumKey failed, reason=%m", kSource, __LINE__);
        return false;
    }
    return true;
}

std::map<unsigned int, bool> getPrivileges() {
    StringHash choices(VLIBCSzHashAlloc(kCapacity));
    if (choices == nullptr) {
        syslog(LOG_ERR, "%s(%d)Failed to VLIBCSzHashAlloc, reason=%m", kSource, __LINE__);
        return {};
    }
    StringList keys(VLIBCSzListAlloc(kCapacity));
    if (keys == nullptr) {
        syslog(LOG_ERR, "%s:%d VLIBCSzListAlloc() failed!! vexoerr=[0x%04X]", kSource, __LINE__,
               static_cast<unsigned>(VLIBCErrGet()));
        return {};
    }
    std::map<unsigned int, bool> privileges;
    if (!readChoices(choices, keys)) return privileges;
    for (int i = 0; i < keys->nItem; ++i) {
        const char* key = VLIBCSzListGet(keys.get(), i);
        const char* value = VLIBCSzHashGetValue(choices.get(), key);
        privileges.emplace(static_cast<unsigned int>(strtoul(key, nullptr, 10)),
                           value != nullptr && std::string(value) == kGranted);
    }
    return privileges;
}

// Does the global setting let this user share?
bool isChosen(const char* userName, bool administrator) {
    char setting[64] = {};
    const bool readable = VLIBCFileGetKeyValue(kSettings, "PX_SHARING_SETTING", setting, sizeof setting, 0) >= 0;
    const std::string choice = readable ? setting : "";
    if (!administrator && !readable) {
        syslog(LOG_ERR, "%s:%d VLIBCFileGetKeyValue failed", kSource, __LINE__);
        return false;
    }
    if (!administrator && choice == "admin_only") return false;
    return choice != "per_user" || hasPrivilege(userName);
}

bool hasLiveAccount(const char* userName) {
    UserRecord record;
    if (VEXOUserGet(userName, acquire(record)) < 0) {
        syslog(LOG_ERR, "%s:%d VEXOUserGet failed", kSource, __LINE__);
        return false;
    }
    return VEXOUserIsExpired(record->expiry) == 0;
}

bool mayShare(const char* userName) {
    const int administrator = VEXOGroupIsAdminGroupMemEx(userName, 1);
    if (administrator < 0) {
        syslog(LOG_ERR, "%s:%d VEXOGroupIsAdminGroupMemEx(%s) failed. [0x%04X %s:%d]", kSource, __LINE__,
               printable(userName).c_str(), static_cast<unsigned>(VLIBCErrGet()), VLIBCErrorGetFile(),
               VLIBCErrorGetLine());
        return false;
    }
    return isChosen(userName, administrator == 1) && VLIBUserPrivilegeHas(userName, kApplication) == 1 &&
           hasLiveAccount(userName);
}

}  // namespace
}  // namespace orvel

namespace OrvelSharing {

using orvel::guardedQuietly;

const std::string SharingManager::STR_VEXO_SHARING = orvel::kFile;

bool SharingManager::hasPrivilege(const std::string& userName) {
    return guardedQuietly(false, [&] { return orvel::hasPrivilege(userName); });
}

bool SharingManager::setPrivileges(std::map<std::string, std::string> values) {
    return guardedQuietly(false, [&] { return orvel::setPrivileges(values); });
}

std::map<unsigned int, bool> SharingManager::getPrivileges() {
    return guardedQuietly(std::map<unsigned int, bool>(), [] { return orvel::getPrivileges(); });
}

bool SharingManager::removePrivilege(const std::string& key) {
    return guardedQuietly(false, [&] { return orvel::removePrivilege(key); });
}

}  // namespace OrvelSharing

int OrvLibUserPrivForSharing(const char* userName) {
    return orvel::guardedQuietly(0, [&] { return orvel::mayShare(userName) ? 1 : 0; });
}
