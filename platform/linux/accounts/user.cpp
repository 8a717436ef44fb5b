// Records of users.
#include <cerrno>
#include <ctime>
#include <exception>
#include <memory>
#include <string>
#include <vector>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "accounts/user_home.h"
#include "ask_again.h"
#include "failure.h"
#include "fault_gate.h"
#include "field.h"
#include "vexo/user.h"

struct VEXOUSERDB {
    std::vector<vexo::Account> accounts;
    size_t next = 0;
};

namespace {

constexpr time_t kSecondsOfDay = 86400;

bool fillRecord(const vexo::Account& account, VEXOUSER& user) {
    user = {};
    user.uid = account.uid;
    user.gid = account.gid;
    user.authType = vexo::splitAccountName(account.name).type;
    if (!vexo::fillField(user.szName, account.name) || !vexo::fillField(user.szHome, vexo::homeOf(account.name)))
        return false;
    user.expiry = vexo::AccountSource::instance().validity(account.name).value_or(vexo::Validity()).expiry;
    return true;
}

int failLookup(vexo::Lookup answer) {
    return vexo::fail(answer == vexo::Lookup::missing ? VEXO_ERR_USER_MISSING : VEXO_ERR_GENERAL);
}

vexo::Lookup findUser(const std::string& name, vexo::Account& account) {
    return vexo::isAccountName(name) ? vexo::AccountSource::instance().user(name, account) : vexo::Lookup::missing;
}

// The same for a record that is asked when the account ends: one that has ended must not pass for one that has not.
vexo::Lookup findWithExpiry(const std::string& name, vexo::Account& account) {
    const vexo::Lookup answer = findUser(name, account);
    if (answer != vexo::Lookup::found || vexo::AccountSource::instance().validity(name)) return answer;
    return vexo::Lookup::failed;
}

int deliver(vexo::Lookup answer, const vexo::Account& account, PVEXOUSER* out) {
    if (answer != vexo::Lookup::found) return failLookup(answer);
    if (!vexo::isAccountName(account.name)) return failLookup(vexo::Lookup::missing);
    auto record = std::make_unique<VEXOUSER>();
    if (!fillRecord(account, *record)) return vexo::fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
    *out = record.release();
    return 0;
}

}  // namespace

int VEXOUserGet(const char* name, PVEXOUSER* out) try {
    if (out != nullptr) *out = nullptr;
    VEXO_GATE("VEXOUserGet", -1);
    if (name == nullptr || out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    const int before = errno;
    vexo::Account account;
    const vexo::Lookup answer = vexo::askAgain([&] { return findWithExpiry(name, account); },
                                               [](vexo::Lookup found) { return found == vexo::Lookup::failed; });
    if (answer != vexo::Lookup::failed) errno = before;
    return deliver(answer, account, out);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOUserGetByUID(uid_t uid, PVEXOUSER* out) try {
    if (out != nullptr) *out = nullptr;
    VEXO_GATE("VEXOUserGetByUID", -1);
    if (out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    vexo::Account account;
    return deliver(vexo::AccountSource::instance().user(uid, account), account, out);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOUserFree(PVEXOUSER user) {
    delete user;
}

int VEXOUserGetUGID(const char* name, uid_t* uid, gid_t* gid) try {
    VEXO_GATE("VEXOUserGetUGID", -1);
    if (name == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    vexo::Account account;
    const vexo::Lookup answer = findUser(name, account);
    if (answer != vexo::Lookup::found) return failLookup(answer);
    if (uid != nullptr) *uid = account.uid;
    if (gid != nullptr) *gid = account.gid;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOUserIsExpired(long expiry) {
    return static_cast<int>(expiry >= 0 && time(nullptr) / kSecondsOfDay >= expiry);
}

PVEXOUSERDB VEXOUserDBOpen() try {
    VEXO_GATE("VEXOUserDBOpen", nullptr);
    auto db = std::make_unique<VEXOUSERDB>();
    if (vexo::AccountSource::instance().users(db->accounts)) return db.release();
    vexo::fail(VEXO_ERR_GENERAL);
    return nullptr;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

int VEXOUserDBGetByCursor(PVEXOUSERDB db, PVEXOUSER* user, AUTH_TYPE type, int next) try {
    VEXO_GATE("VEXOUserDBGetByCursor", -1);
    static_cast<void>(next);
    if (db == nullptr || user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    while (db->next < db->accounts.size()) {
        const vexo::Account& account = db->accounts[db->next++];
        if (vexo::splitAccountName(account.name).type != type || !vexo::isAccountName(account.name)) continue;
        if (*user == nullptr) *user = new VEXOUSER();
        if (fillRecord(account, **user)) return 0;
    }
    return 1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOUserDBClose(PVEXOUSERDB db) {
    delete db;
}
