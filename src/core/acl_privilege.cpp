// What the calling identity may do with real paths.
#include "core/acl_privilege.h"

#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/privilege_decision.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "vexo/acl.h"
#include "vexo/error.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";
constexpr unsigned kEveryBit = 0x1FFF;

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

}  // namespace

bool mayListFolder(const GivenFolder& folder) {
    OrvLibSetErr(ORV_ERR_NONE);
    const EnteredFolder entered = folder.enter();
    if (!entered.folder) reportUnlistable(folder.text(), entered.failure, entered.error);
    return static_cast<bool>(entered.folder);
}

void reportUnlistable(const std::string& text, EntryFailure failure, int error) {
    OrvLibSetErr(folderCodeOf(error));
    const std::string shown = printable(text);
    if (failure == EntryFailure::kChangeDirectory) {
        syslog(LOG_ERR, "%s:%d Failed to chdir %s. [%s]", kSource, __LINE__, shown.c_str(), strerror(error));
    } else {
        syslog(LOG_ERR, "%s:%d Failed to opendir %s. [%s]", kSource, __LINE__, shown.c_str(), strerror(error));
    }
}

unsigned permissionsOf(const char* path, const char* text) {
    unsigned permission = 0;
    if (VEXOACLPermGet(path, &permission) >= 0) return permission;
    const int reason = VLIBCErrGet();
    if (!isExpectedFailure(reason)) {
        syslog(LOG_ERR, "%s:%d Failed to get the ACL Privilege: file = %s, euid = %u, reason=[%X]", kSource, __LINE__,
               printable(text).c_str(), geteuid(), static_cast<unsigned>(reason));
    }
    return kEveryBit;
}

}  // namespace orvel

bool CheckDirListPrivilege(const char* realDir) {
    return orvel::guarded(false,
                          [&] { return realDir != nullptr && orvel::mayListFolder(orvel::GivenFolder(realDir)); });
}

int ACLAccess(const char* realPath, int requested) {
    return orvel::guarded(-1, [&] { return orvel::checkAccess(realPath, requested); });
}

unsigned int GetACLPrivilege(const char* realPath) {
    return orvel::guardedQuietly(orvel::kEveryBit, [&] { return orvel::permissionsOf(realPath, realPath); });
}
