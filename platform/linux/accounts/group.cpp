// Records of groups, and the groups of users.
#include <grp.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <memory>
#include <string>
#include <vector>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "failure.h"
#include "fault_gate.h"
#include "field.h"
#include "settings/appliance_setting.h"
#include "vexo/user.h"

struct VEXOGROUPDB {
    std::vector<vexo::Group> groups;
    size_t next = 0;
};

namespace {

bool fillRecord(const vexo::Group& from, VEXOGROUP& group) {
    group.gid = from.gid;
    return vexo::fillField(group.szName, from.name);
}

int failLookup(vexo::Lookup answer) {
    return vexo::fail(answer == vexo::Lookup::missing ? VEXO_ERR_USER_MISSING : VEXO_ERR_GENERAL);
}

// The groups of a user who must exist; -1 with the slot filled, else 0.
int findGroups(const char* user, std::vector<gid_t>& gids) {
    vexo::AccountSource& accounts = vexo::AccountSource::instance();
    vexo::Account account;
    const vexo::Lookup answer = accounts.user(user, account);
    if (answer != vexo::Lookup::found) return failLookup(answer);
    return accounts.groupsOf(user, account.gid, gids) ? 0 : vexo::fail(VEXO_ERR_GENERAL);
}

// Whether the process has groups that are not among these. False with errno when the kernel does not say.
bool hasOtherGroups(const std::vector<gid_t>& own, bool& others) {
    std::vector<gid_t> held(static_cast<size_t>(std::max(getgroups(0, nullptr), 0)));
    const int count = getgroups(static_cast<int>(held.size()), held.data());
    if (count < 0) return false;
    held.resize(static_cast<size_t>(count));
    held.push_back(getegid());
    others = std::any_of(held.begin(), held.end(),
                         [&](gid_t gid) { return std::find(own.begin(), own.end(), gid) == own.end(); });
    return true;
}

int ownsProcess(const char* user, uid_t effective) {
    vexo::Account account;
    const vexo::Lookup answer = vexo::AccountSource::instance().user(user, account);
    if (answer != vexo::Lookup::found) return failLookup(answer);
    if (account.uid != effective || account.gid != getegid()) return 0;
    std::vector<gid_t> own;
    bool others = true;
    if (!vexo::AccountSource::instance().groupsOf(user, account.gid, own)) return vexo::fail(VEXO_ERR_GENERAL);
    if (!hasOtherGroups(own, others)) return vexo::fail(VEXO_ERR_GENERAL);
    return others ? 0 : 1;
}

int isAdministrator(const char* user) {
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    std::vector<gid_t> gids;
    if (findGroups(user, gids) < 0) return -1;
    const auto name = vexo::administratorsGroup();
    if (!name) return vexo::fail(VEXO_ERR_GENERAL);
    vexo::Group administrators;
    const vexo::Lookup answer = vexo::AccountSource::instance().group(*name, administrators);
    if (answer == vexo::Lookup::failed) return vexo::fail(VEXO_ERR_GENERAL);
    const bool member =
        answer == vexo::Lookup::found && std::find(gids.begin(), gids.end(), administrators.gid) != gids.end();
    return static_cast<int>(member);
}

}  // namespace

int VEXOGroupGetByGID(gid_t gid, PVEXOGROUP* out) try {
    if (out != nullptr) *out = nullptr;
    VEXO_GATE("VEXOGroupGetByGID", -1);
    if (out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    vexo::Group group;
    const vexo::Lookup answer = vexo::AccountSource::instance().group(gid, group);
    if (answer != vexo::Lookup::found) return failLookup(answer);
    auto record = std::make_unique<VEXOGROUP>();
    if (!fillRecord(group, *record)) return vexo::fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
    *out = record.release();
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOGroupFree(PVEXOGROUP group) {
    delete group;
}

int VEXOGroupGetGID(const char* name, gid_t* gid) try {
    VEXO_GATE("VEXOGroupGetGID", -1);
    if (name == nullptr || gid == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    vexo::Group group;
    const vexo::Lookup answer = vexo::AccountSource::instance().group(name, group);
    if (answer != vexo::Lookup::found) return failLookup(answer);
    *gid = group.gid;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

PVEXOGROUPDB VEXOGroupDBOpen() try {
    VEXO_GATE("VEXOGroupDBOpen", nullptr);
    auto db = std::make_unique<VEXOGROUPDB>();
    if (vexo::AccountSource::instance().groups(db->groups)) return db.release();
    vexo::fail(VEXO_ERR_GENERAL);
    return nullptr;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

int VEXOGroupDBGetByCursor(PVEXOGROUPDB db, PVEXOGROUP* group, AUTH_TYPE type, int next) try {
    VEXO_GATE("VEXOGroupDBGetByCursor", -1);
    static_cast<void>(next);
    if (db == nullptr || group == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    while (db->next < db->groups.size()) {
        const vexo::Group& from = db->groups[db->next++];
        if (vexo::splitAccountName(from.name).type != type) continue;
        if (*group == nullptr) *group = new VEXOGROUP();
        if (fillRecord(from, **group)) return 0;
    }
    return 1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOGroupDBClose(PVEXOGROUPDB db) {
    delete db;
}

int VEXOGroupInfoGetgroupList(const char* user, PVLIBCSZLIST* gids, int flags) try {
    VEXO_GATE("VEXOGroupInfoGetgroupList", -1);
    static_cast<void>(flags);
    if (user == nullptr || gids == nullptr || *gids == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    std::vector<gid_t> found;
    if (findGroups(user, found) < 0) return -1;
    for (const gid_t gid : found) {
        if (VLIBCSzListPush(gids, std::to_string(gid).c_str()) < 0) return -1;
    }
    return static_cast<int>(found.size());
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOGroupIsAdminGroupMem(const char* user) try {
    VEXO_GATE("VEXOGroupIsAdminGroupMem", -1);
    return isAdministrator(user);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOGroupIsAdminGroupMemEx(const char* user, int flags) try {
    VEXO_GATE("VEXOGroupIsAdminGroupMemEx", -1);
    static_cast<void>(flags);
    return isAdministrator(user);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOUserOwnsProcess(const char* user) try {
    VEXO_GATE("VEXOUserOwnsProcess", -1);
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    uid_t real = 0;
    uid_t effective = 0;
    uid_t saved = 0;
    if (getresuid(&real, &effective, &saved) != 0) return vexo::fail(VEXO_ERR_GENERAL);
    if (effective == 0) return isAdministrator(user);
    return saved != 0 ? 1 : ownsProcess(user, effective);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOUserInitGroups(const char* user, gid_t gid) try {
    VEXO_GATE("VEXOUserInitGroups", -1);
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    std::vector<gid_t> gids;
    if (!vexo::AccountSource::instance().groupsOf(user, gid, gids)) return vexo::fail(VEXO_ERR_GENERAL);
    return setgroups(gids.size(), gids.data()) == 0 ? 0 : vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
