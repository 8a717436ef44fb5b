#include "orvel/privilege_reason.h"

#include <fcntl.h>
#include <sys/statvfs.h>
#include <syslog.h>

#include <cerrno>
#include <iterator>
#include <memory>
#include <string>

#include "base/beneath.h"
#include "base/owner.h"
#include "core/boundary.h"
#include "core/privilege_facts.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/mount_status.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "vexo/acl.h"
#include "vexo/filesystem.h"
#include "vexo/stat.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";

using PermissionFolder = std::unique_ptr<VEXOACLFOLDER, Releaser<VEXOACLFolderClose>>;

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
}

[[nodiscard]] bool failWith(int systemCode) {
    OrvLibSetErr(OrvParseErrnoToError(systemCode, nullptr, nullptr));
    return false;
}

// The rights on what is open, which removing it has from the folder that holds it. Asked of that folder, since a path
// could lead elsewhere by now.
[[nodiscard]] bool explainRights(const Descriptor& root, const Descriptor& file, PrivilegeReason& reason) {
    const std::string top = realPathOf(root), path = realPathOf(file);
    if (path == top) {
        reason.aclBits = GetACLPrivilege(reason.shareRoot.c_str());
        return true;
    }
    if (top.empty() || !path.starts_with(top + "/")) return failWith(ENOENT);  // moved away meanwhile
    const size_t slash = path.rfind('/');
    const std::string name = path.substr(slash + 1);
    const Descriptor parent =
        openBeneath(root, pathBelow(top, path.substr(0, slash)), LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    _tag_VEXOSTAT_ status;
    if (!parent || VLIBCFileLStatAt(parent.get(), name.c_str(), VEXO_STAT_BASIC, &status) < 0) return failWith(errno);
    const PermissionFolder folder(VEXOACLFolderOpen(parent.get()));
    if (!folder || VEXOACLFolderPermGet(folder.get(), name.c_str(), &status, &reason.aclBits) < 0) {
        return failWith(errno);
    }
    return true;
}

// What the user cannot see does not exist, and what lies outside the share is not seen. Other failures are not taken
// for an answer.
bool isOutOfSight(int error) {
    switch (error) {
        case ENOENT:
        case ENOTDIR:
        case EACCES:
        case EPERM:
        case EXDEV:
        case ELOOP:
        case ENAMETOOLONG:
            return true;
        default:
            return false;
    }
}

[[nodiscard]] bool explainFile(PrivilegeReason& reason) {
    const Descriptor root(open(reason.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    const std::string path = pathBelow(reason.shareRoot, reason.realPath);
    const Descriptor file = root ? openBeneath(root, path, LinkPolicy::kInside, O_PATH) : Descriptor();
    reason.exists = static_cast<bool>(file);
    if (!file) return isOutOfSight(errno) || failWith(errno);
    struct statvfs status;
    if (fstatvfs(file.get(), &status) == 0 && (status.f_flag & ST_RDONLY) != 0) reason.readOnly = true;
    return explainRights(root, file, reason);
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
    return reason.remote || explainFile(reason);
}

}  // namespace
}  // namespace orvel

bool ExplainPrivilege(const char* path, const char* user, const char* sid, PrivilegeReason& reason) {
    return orvel::guarded(false, [&] { return orvel::explain(path, user, sid, reason); });
}
