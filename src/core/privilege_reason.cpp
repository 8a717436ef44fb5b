#include "orvel/privilege_reason.h"

#include <fcntl.h>
#include <sys/statvfs.h>
#include <syslog.h>
#include <unistd.h>

#include <iterator>

#include "core/boundary.h"
#include "core/privilege_facts.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/mount_status.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "vexo/filesystem.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";

[[nodiscard]] bool explainShare(const char* path, const char* user, const char* sid, PrivilegeReason& reason) {
    if (IsDirUserHome(path, nullptr)) {
        reason.rule = PrivilegeRule::kHome;
        return true;
    }
    ShareFacts facts;
    if (!askShare(path, user, sid, AskLists::kAll, facts)) return false;
    const ShareVerdict verdict = judgeShare(facts);
    reason.rule = verdict.rule;
    reason.privilege = verdict.privilege;
    reason.inNoAccessList = facts.lists.noAccess;
    reason.inReadWriteList = facts.lists.readWrite;
    reason.inReadOnlyList = facts.lists.readOnly;
    reason.shareMask = facts.mask;
    reason.effectiveMask = effectiveMask(reason.administrator, facts.mask);
    return true;
}

void explainMount(const std::string& realPath, PrivilegeReason& reason) {
    const int type = VEXOGetFSType(realPath.c_str(), 0);
    const bool named = type >= 0 && type < static_cast<int>(std::size(rgszFsType));
    reason.fsType = named ? rgszFsType[type] : "unknown";
    reason.remote = VEXOFSIsRemoteFS(type) == 1;
    reason.readOnly = OrvelMountStatus().IsReadOnly(realPath.c_str());
    if (reason.remote) return;
    struct statvfs status;
    if (statvfs(realPath.c_str(), &status) == 0 && (status.f_flag & ST_RDONLY) != 0) reason.readOnly = true;
}

void explainFile(const std::string& realPath, PrivilegeReason& reason) {
    reason.exists = faccessat(AT_FDCWD, realPath.c_str(), F_OK, AT_EACCESS) == 0;
    if (reason.exists) reason.aclBits = GetACLPrivilege(realPath.c_str());
}

bool explain(const char* path, const char* user, const char* sid, PrivilegeReason& reason) {
    reason = {};
    if (!askAdministrator(user, reason.administrator)) return false;
    if (path == nullptr || user == nullptr) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s(%d): bad parameter!", kSource, __LINE__);
        return false;
    }
    if (!explainShare(path, user, sid, reason)) return false;
    PathInfo info;
    if (!PathInfoFactory::create(user, path, info)) return false;
    reason.shareName = info.shareName;
    reason.shareRoot = info.shareRoot;
    reason.realPath = info.realPath;
    explainMount(info.realPath, reason);
    if (!reason.remote) explainFile(info.realPath, reason);
    return true;
}

}  // namespace
}  // namespace orvel

bool ExplainPrivilege(const char* path, const char* user, const char* sid, PrivilegeReason& reason) {
    return orvel::guarded(false, [&] { return orvel::explain(path, user, sid, reason); });
}
