#include "orvel/identity.h"

#include <grp.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/identity_state.h"
#include "orvel/error_state.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/session.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveluser";
constexpr uid_t kUnknownUid = static_cast<uid_t>(-1);
constexpr gid_t kUnknownGid = static_cast<gid_t>(-1);

struct Ids {
    uid_t uid = kUnknownUid;
    gid_t gid = kUnknownGid;
};

// The session knows the gid of its user; the uid then stays unknown here and comes from the session as well. Only when
// the session does not answer are both read from the user source.
[[nodiscard]] bool findIds(const char* sid, const char* user, Ids& ids) {
    if (sid != nullptr) {
        ids.gid = VexoCgiGIDGet(sid, user);
        if (ids.gid != kUnknownGid) return true;
    }
    return VEXOUserGetUGID(user, &ids.uid, &ids.gid) >= 0;
}

int reportUnknownIds(const char* sid, const char* user) {
    OrvLibSetErr(VLIBCErrGet() == VEXO_ERR_USER_MISSING ? ORV_ERR_USER : ORV_ERR_GENERAL);
    if (sid != nullptr) {
        syslog(LOG_ERR, "%s:%d Failed to get GID for user=%s, sid=%s", kSource, __LINE__, printable(user).c_str(),
               printable(sid).c_str());
    } else {
        syslog(LOG_ERR, "%s:%d Failed to get GID for user=%s", kSource, __LINE__, printable(user).c_str());
    }
    return -1;
}

// While the process is still root its group list becomes the user's. When that fails root's own groups must not stay
// behind, whatever the rest of the switch does.
void switchGroupList(const char* sid, const char* user, gid_t gid) {
    if (geteuid() != 0 || VEXOUserInitGroups(user, gid) == 0) return;
    syslog(LOG_ERR, "%s:%d Failed to initgroup for user=%s, sid=%s", kSource, __LINE__, printable(user).c_str(),
           printable(sid).c_str());
    if (setgroups(0, nullptr) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to drop the groups of root, reason=%s", kSource, __LINE__, strerror(errno));
    }
}

int setUserAndGroups(const char* sid, const char* user) {
    if (user == nullptr) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        syslog(LOG_ERR, "%s:%d Bad parameter", kSource, __LINE__);
        return -1;
    }
    Ids ids;
    if (!findIds(sid, user, ids)) return reportUnknownIds(sid, user);

    switchGroupList(sid, user, ids.gid);
    if (OrvLibEGIDSet(sid, user, ids.gid) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to set GID for user=%s, sid=%s", kSource, __LINE__, printable(user).c_str(),
               printable(sid).c_str());
        return -1;
    }
    if (OrvLibEUIDSet(sid, user, ids.uid) != 0) {
        syslog(LOG_ERR, "%s:%d Failed to set UID for user=%s, sid=%s", kSource, __LINE__, printable(user).c_str(),
               printable(sid).c_str());
        return -1;
    }
    if (!actsAs(user)) {
        syslog(LOG_ERR, "%s:%d The switch to user=%s left the process at uid %u, gid %u", kSource, __LINE__,
               printable(user).c_str(), static_cast<unsigned>(geteuid()), static_cast<unsigned>(getegid()));
    }
    return 0;
}

int setGroup(const char* sid, const char* user, gid_t gid) {
    if (user == nullptr || (sid == nullptr && gid == kUnknownGid)) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        syslog(LOG_ERR, "%s:%d bad parameter", kSource, __LINE__);
        return -1;
    }
    if (gid == kUnknownGid) gid = VexoCgiGIDGet(sid, user);
    if (gid == kUnknownGid) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        return -1;
    }
    // Kept unchecked, as for the uid: an ordinary user's process goes on as itself.
    [[maybe_unused]] const int ignored = setegid(gid);
    return 0;
}

int setUser(const char* sid, const char* user, uid_t uid) {
    const int administrator = VEXOGroupIsAdminGroupMem(user);  // kept: asked even for a null user
    if (user == nullptr || (sid == nullptr && uid == kUnknownUid)) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        syslog(LOG_ERR, "%s:%d bad parameter", kSource, __LINE__);
        return -1;
    }
    if (administrator < 0) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s:%d VEXOGroupIsAdminGroupMem(%s) failed. [0x%04X %s:%d]", kSource, __LINE__,
               printable(user).c_str(), static_cast<unsigned>(VLIBCErrGet()), VLIBCErrorGetFile(), VLIBCErrorGetLine());
        return -1;
    }
    if (administrator == 1) {
        uid = 0;
    }
    if (uid == kUnknownUid) uid = VexoCgiUIDGet(sid, user);
    if (uid == kUnknownUid) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        return -1;
    }
    [[maybe_unused]] const int ignored = seteuid(uid);
    return 0;
}

[[nodiscard]] bool keepsOwners(int fsType) {
    return fsType != VEXO_FS_FAT && VEXOFSIsRemoteFS(fsType) != 1 && VEXOFSIsImageFS(fsType) != 1;
}

int handOver(const char* file, const char* user) {
    if (file == nullptr) {
        syslog(LOG_ERR, "%s(%d) bad parameter", kSource, __LINE__);
        return -1;
    }
    const int fsType = VEXOGetFSType(file, 0);
    if (fsType < 0) {
        // Kept: here the function's name comes first and the source's third.
        syslog(LOG_ERR, "%s:%d(%s) : failed to get file-system type dir = %s", "OrvLibChown2Admin", __LINE__, kSource,
               printable(file).c_str());
        return -1;
    }
    if (!keepsOwners(fsType)) return 0;

    Ids ids;
    if (VEXOUserGetUGID(user, &ids.uid, &ids.gid) < 0) return -1;
    if (lchown(file, ids.uid, ids.gid) != 0) {
        const int reason = errno;
        syslog(LOG_ERR, "%s(%d) change %s owner to admin fail(%s)", kSource, __LINE__, printable(file).c_str(),
               strerror(reason));
        return -1;
    }
    return 0;
}

}  // namespace

bool actsAs(const char* user) {
    return VEXOUserOwnsProcess(user) == 1;
}

}  // namespace orvel

int OrvLibUGIDSet(const char* sid, const char* user) {
    return orvel::guarded(-1, [&] { return orvel::setUserAndGroups(sid, user); });
}

int OrvLibEGIDSet(const char* sid, const char* user, gid_t gid) {
    return orvel::guarded(-1, [&] { return orvel::setGroup(sid, user, gid); });
}

int OrvLibEUIDSet(const char* sid, const char* user, uid_t uid) {
    return orvel::guarded(-1, [&] { return orvel::setUser(sid, user, uid); });
}

int OrvLibChown2Admin(const char* file, const char* user) {
    return orvel::guardedQuietly(-1, [&] { return orvel::handOver(file, user); });
}
