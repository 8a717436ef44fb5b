// What the calling identity may do with real paths.
#include <dirent.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "core/privilege_decision.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "vexo/acl.h"
#include "vexo/error.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";
constexpr unsigned kEveryBit = 0x1FFF;

int codeOfFolderError(int err) {
    switch (err) {
        case ENOENT:
        case ENOTDIR:
            return ORV_ERR_MISSING;
        case EPERM:
        case EACCES:
            return ORV_ERR_DENIED;
        default:
            return ORV_ERR_DIRECTORY;
    }
}

bool mayListFolder(const char* realDir) {
    if (realDir == nullptr) return false;
    OrvLibSetErr(ORV_ERR_NONE);
    if (chdir(realDir) != 0) {
        const int failure = errno;
        OrvLibSetErr(codeOfFolderError(failure));
        syslog(LOG_ERR, "%s:%d Failed to chdir %s. [%s]", kSource, __LINE__, printable(realDir).c_str(),
               strerror(failure));
        return false;
    }
    const Directory folder(opendir(realDir));
    if (folder == nullptr) {
        const int failure = errno;
        OrvLibSetErr(codeOfFolderError(failure));
        syslog(LOG_ERR, "%s:%d Failed to opendir %s. [%s]", kSource, __LINE__, printable(realDir).c_str(),
               strerror(failure));
        return false;
    }
    return true;
}

int answerWithoutPermissions(const char* realPath) {
    const int reason = VLIBCErrGet();
    switch (reason) {
        case VEXO_ERR_READ_ONLY:
            OrvLibSetErr(ORV_ERR_READ_ONLY);
            return -1;
        case VEXO_ERR_MISSING:
        case VEXO_ERR_TARGET_EXISTS:
        case VEXO_ERR_ACL_TARGET_MISSING:
            OrvLibSetErr(ORV_ERR_MISSING);
            return -1;
        case VEXO_ERR_DENIED:
        case VEXO_ERR_NO_ACL:
            return 0;  // no ACL applies
        default:
            syslog(LOG_ERR, "%s:%d Failed to get the ACL Privilege: file = %s, reason=[%X]", kSource, __LINE__,
                   printable(realPath).c_str(), static_cast<unsigned>(reason));
            return -1;
    }
}

int checkAccess(const char* realPath, int requested) {
    if (realPath == nullptr || requested == 0) return -1;
    unsigned permission = 0;
    if (VEXOACLPermGet(realPath, &permission) < 0) return answerWithoutPermissions(realPath);
    if (aclGrants(permission, requested)) return 0;
    OrvLibSetErr(ORV_ERR_DENIED);
    VLIBCErrSetEx(VEXO_ERR_DENIED, kSource, __LINE__);
    return -1;
}

// A read-only file system is not among the silent ones here.
bool isExpectedFailure(int reason) {
    return reason == VEXO_ERR_DENIED || reason == VEXO_ERR_MISSING || reason == VEXO_ERR_ACL_TARGET_MISSING ||
           reason == VEXO_ERR_NO_ACL;
}

unsigned permissionsOf(const char* realPath) {
    unsigned permission = 0;
    if (VEXOACLPermGet(realPath, &permission) >= 0) return permission;
    const int reason = VLIBCErrGet();
    if (!isExpectedFailure(reason)) {
        syslog(LOG_ERR, "%s:%d Failed to get the ACL Privilege: file = %s, euid = %u, reason=[%X]", kSource, __LINE__,
               printable(realPath).c_str(), geteuid(), static_cast<unsigned>(reason));
    }
    return kEveryBit;
}

}  // namespace
}  // namespace orvel

bool CheckDirListPrivilege(const char* realDir) {
    return orvel::guarded(false, [&] { return orvel::mayListFolder(realDir); });
}

int ACLAccess(const char* realPath, int requested) {
    return orvel::guarded(-1, [&] { return orvel::checkAccess(realPath, requested); });
}

unsigned int GetACLPrivilege(const char* realPath) {
    return orvel::guardedQuietly(orvel::kEveryBit, [&] { return orvel::permissionsOf(realPath); });
}
