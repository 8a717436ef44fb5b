#include "orvel/privilege.h"

#include <syslog.h>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/privilege_facts.h"
#include "orvel/error_state.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";

int findPrivilege(const char* path, const char* user, const char* sid, int* privilege, int* restrictionMask) {
    if (privilege != nullptr) *privilege = ORV_PRIVILEGE_UNKNOWN;
    bool administrator = false;
    if (!askAdministrator(user, administrator)) return -1;  // kept: asked before the arguments are looked at
    if (path == nullptr || user == nullptr || privilege == nullptr) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s(%d): bad parameter!", kSource, __LINE__);
        return -1;
    }
    ShareFacts facts;
    if (!askShare(path, user, sid, AskLists::kUntilDecided, facts)) return -1;
    *privilege = judgeShare(facts).privilege;
    if (restrictionMask != nullptr) *restrictionMask = static_cast<int>(effectiveMask(administrator, facts.mask));
    return 0;
}

int hasPrivilege(const char* path, const char* user, const char* sid, int wanted) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (path == nullptr || user == nullptr) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s(%d): bad parameter! username=%s, path=%s", kSource, __LINE__, printable(user).c_str(),
               printable(path).c_str());
        return -1;
    }
    int privilege = ORV_PRIVILEGE_UNKNOWN;
    int mask = 0;
    if (OrvLibGetPrivilege(path, user, sid, &privilege, &mask) < 0) {
        syslog(LOG_ERR, "%s(%d): failed to get privilege of %s at %s", kSource, __LINE__, printable(user).c_str(),
               printable(path).c_str());
        return -1;
    }
    return privilege == wanted ? 1 : 0;  // kept: exactly, read-write does not imply read-only
}

}  // namespace
}  // namespace orvel

int OrvLibGetPrivilege(const char* path, const char* user, const char* sid, int* privilege, int* restrictionMask) {
    return orvel::guarded(-1, [&] { return orvel::findPrivilege(path, user, sid, privilege, restrictionMask); });
}

int OrvLibHasPrivilege(const char* path, const char* user, const char* sid, int wanted) {
    return orvel::guarded(-1, [&] { return orvel::hasPrivilege(path, user, sid, wanted); });
}
