// Records of groups, and the groups of users.
#include <grp.h>

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
#include "vexo/settings.h"
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

int isAdministrator(const char* user) {
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    std::vector<gid_t> gids;
    if (findGroups(user, gids) < 0) return -1;
    const std::string name = VexoConf::Info().Get("admin_group", "administrators");
    vexo::Group administrators;
    const vexo::Lookup answer = vexo::AccountSource::instance().group(name, administrators);
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

int VEXOUserInitGroups(const char* user, gid_t gid) try {
    VEXO_GATE("VEXOUserInitGroups", -1);
    if (user == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    std::vector<gid_t> gids;
    if (!vexo::AccountSource::instance().groupsOf(user, gid, gids)) return vexo::fail(VEXO_ERR_GENERAL);
    return setgroups(gids.size(), gids.data()) == 0 ? 0 : vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
