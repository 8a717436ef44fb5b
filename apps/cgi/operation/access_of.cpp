// What another user, or the members of a group, may do with an item, and why.
//
// Parameters "user" or "group": a name. data: {"rights": ["read","write","enter"], "by": "administrator", "owner",
// "user", "group" or "other", what gives the rights, "groups": [name] of "group", "masked": rights that a mask
// withholds, "closed": [path] of folders above that may not be entered, "unknown": [path] of those that the asking user
// may not know either}; to an administrator also "share": {"rule","privilege"}, what the share's own lists say about
// the user.
#include <fcntl.h>
#include <json/value.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <sstream>

#include "base/owner.h"
#include "operation/operation.h"
#include "operation/permission_item.h"
#include "orvel/error_state.h"
#include "orvel/user_directory.h"
#include "reply.h"
#include "text.h"
#include "vexo/list.h"
#include "vexo/user.h"
#include "why/reason.h"

namespace orvel::cgi {
namespace {

struct Somebody {
    std::optional<uid_t> user;
    std::vector<gid_t> groups;
    bool administrator = false;
};

struct Verdict {
    unsigned rights = 0, masked = 0;
    const char* by = "other";
    std::vector<gid_t> groups;  // that gave them
};

// As the kernel decides, right by right.
Verdict judgeAccess(const Permissions& permissions, bool isFolder, const Somebody& who) {
    const Grants& list = permissions.access;
    if (who.administrator) {
        const bool runs = isFolder || std::any_of(list.begin(), list.end(),
                                                  [](const Grant& grant) { return (grant.rights & kMayRun) != 0; });
        return {runs ? kMayAll : kMayRead | kMayWrite, 0, "administrator", {}};
    }
    if (who.user == permissions.owner) return {rightsOf(list, Holder::kOwner), 0, "owner", {}};
    const Grant* own = who.user ? grantOf(list, Holder::kUser, *who.user) : nullptr;
    if (own != nullptr) return {effective(list, *own), own->rights & ~effective(list, *own), "user", {}};
    Verdict verdict;
    unsigned granted = 0;
    for (const Grant& grant : list) {
        const bool owning = grant.holder == Holder::kOwningGroup;
        const gid_t group = owning ? permissions.group : grant.id;
        const bool isIn = (owning || grant.holder == Holder::kGroup) &&
                          std::find(who.groups.begin(), who.groups.end(), group) != who.groups.end();
        if (!isIn) continue;
        granted |= grant.rights;
        verdict.rights |= effective(list, grant);
        verdict.groups.push_back(group);
    }
    if (verdict.groups.empty()) return {rightsOf(list, Holder::kOthers), 0, "other", {}};
    verdict.by = "group";
    verdict.masked = granted & ~verdict.rights;
    return verdict;
}

int findSomebody(const Operation& operation, Somebody& who) {
    const std::string user = operation.web.GetParam("user", ""), group = operation.web.GetParam("group", "");
    uid_t uid = 0;
    gid_t gid = 0;
    if (user.empty() == group.empty()) return ORV_ERR_PARAMETER;
    if (user.empty()) {
        if (VEXOGroupGetGID(group.c_str(), &gid) != 0) return ORV_ERR_GROUP;
        who.groups = {gid};
        return ORV_ERR_NONE;
    }
    if (VEXOUserGetUGID(user.c_str(), &uid, &gid) != 0) return ORV_ERR_USER;
    who.user = uid;
    std::unique_ptr<VLIBCSZLIST, Releaser<VLIBCSzListFree>> groups(VLIBCSzListAlloc(0));
    const int administrator = VEXOGroupIsAdminGroupMem(user.c_str());
    if (groups == nullptr || administrator < 0 || VEXOGroupInfoGetgroupList(user.c_str(), lend(groups), 0) < 0) {
        return ORV_ERR_GENERAL;  // half of his groups would say something wrong
    }
    who.administrator = administrator == 1;
    for (int i = 0; i < groups->nItem; ++i) {
        const auto id = parseNumber(VLIBCSzListGet(groups.get(), i));
        if (id) who.groups.push_back(static_cast<gid_t>(*id));
    }
    return ORV_ERR_NONE;
}

Json::Value wordsOf(unsigned rights) {
    Json::Value words(Json::arrayValue);
    if ((rights & kMayRead) != 0) words.append("read");
    if ((rights & kMayWrite) != 0) words.append("write");
    if ((rights & kMayRun) != 0) words.append("enter");
    return words;
}

// The folders above the item, from the share's root on, as they lie, free of links.
int judgeFolders(const Item& item, const Somebody& who, Json::Value& data) {
    data["closed"] = data["unknown"] = Json::Value(Json::arrayValue);
    const auto within = pathInShare(item.info, item.place.folder);
    if (!within) return ORV_ERR_MISSING;
    Descriptor folder(open(item.info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    std::string path = "/" + item.info.shareName, name;
    std::istringstream names(*within);
    std::getline(names, name, '/');  // what is before the first one
    for (bool more = true; more; more = static_cast<bool>(std::getline(names, name, '/'))) {
        if (!name.empty()) {
            folder = openBeneath(folder, name, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
            path += "/" + name;
        }
        Permissions permissions;
        if (!folder) return ORV_ERR_MISSING;
        if (readKnown(folder, permissions) != ORV_ERR_NONE) {
            data["unknown"].append(readable(path));
        } else if ((judgeAccess(permissions, true, who).rights & kMayRun) == 0) {
            data["closed"].append(readable(path));
        }
    }
    return ORV_ERR_NONE;
}

}  // namespace

int accessOperation(Operation& operation) {
    Somebody who;
    Item item;
    Descriptor opened;
    Permissions permissions;
    Json::Value data;
    int code = findSomebody(operation, who);
    if (code == ORV_ERR_NONE) code = openItem(operation.user, operation.path, {Need::kList}, item);
    if (code != ORV_ERR_NONE) return code;
    if (S_ISLNK(item.status.st_mode) || !openForPermissions(item, opened)) return ORV_ERR_MISSING;
    code = readKnown(opened, permissions);
    if (code == ORV_ERR_NONE) code = judgeFolders(item, who, data);
    if (code != ORV_ERR_NONE) return code;
    const Verdict verdict = judgeAccess(permissions, S_ISDIR(item.status.st_mode), who);
    OrvelUserEnum names;
    data["rights"] = wordsOf(verdict.rights);
    data["masked"] = wordsOf(verdict.masked);
    data["by"] = verdict.by;
    for (const gid_t group : verdict.groups) data["groups"].append(names.GetGroupNameByGID(group));
    const std::string user = operation.web.GetParam("user", "");
    PrivilegeReason reason;
    // Who else is in the lists of a share is its administrators' to know.
    if (geteuid() == 0 && !user.empty()) {
        OrvLibSetErr(ORV_ERR_NONE);
        if (!ExplainPrivilege(operation.path.c_str(), user.c_str(), "", reason)) return lastCode();
        data["share"]["rule"] = ruleWord(reason.rule);
        data["share"]["privilege"] = reason.privilege;
    }
    operation.data = data;
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
