#include "orvel/user_directory.h"

#include "core/boundary.h"
#include "core/owned.h"

std::string OrvelUserEnum::GetUserNameByUID(unsigned int uid) {
    return orvel::guardedQuietly(std::string(), [&] {
        auto found = users_.find(uid);
        if (found == users_.end() && UpdateUserInfoMap(uid, false)) found = users_.find(uid);
        return found == users_.end() ? std::string() : found->second.name;
    });
}

std::string OrvelUserEnum::GetGroupNameByGID(unsigned int gid) {
    return orvel::guardedQuietly(std::string(), [&] {
        auto found = groups_.find(gid);
        if (found == groups_.end() && UpdateGroupInfoMap(gid, false)) found = groups_.find(gid);
        return found == groups_.end() ? std::string() : found->second.name;
    });
}

bool OrvelUserEnum::UpdateUserInfoMap(unsigned int uid, bool /*flag*/) {
    return orvel::guardedQuietly(false, [&] {
        orvel::UserRecord user;
        if (VEXOUserGetByUID(uid, orvel::acquire(user)) < 0) return false;
        users_[uid].name = user->szName;
        return true;
    });
}

bool OrvelUserEnum::UpdateGroupInfoMap(unsigned int gid, bool /*flag*/) {
    return orvel::guardedQuietly(false, [&] {
        orvel::GroupRecord group;
        if (VEXOGroupGetByGID(gid, orvel::acquire(group)) < 0) return false;
        groups_[gid].name = group->szName;
        return true;
    });
}
