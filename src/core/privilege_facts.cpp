#include "core/privilege_facts.h"

#include <syslog.h>

#include "base/printable.h"
#include "core/owned.h"
#include "core/path_component.h"
#include "core/user_kind.h"
#include "orvel/error_state.h"
#include "vexo/error.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";
constexpr int kServerNotReached = -2;

// False with the code set when the service failed.
[[nodiscard]] bool askService(UserKind kind, const char* user, const char* sid, ShareFacts& facts) {
    int privilege = -1;
    const auto service = kind == UserKind::kDomain ? VexoCgiDomGetPrivilege : VexoCgiLDAPGetPrivilege;
    const int result = service(facts.shareName.c_str(), user, sid, &privilege);
    if (result < 0) {
        OrvLibSetErr(result == kServerNotReached ? ORV_ERR_SERVER : ORV_ERR_DIRECTORY);
        return false;
    }
    facts.serviceAnswer = privilege;
    return true;
}

// Whether the list names the user. The platform's slot alone says when that could not be looked up; what it held
// before stays unless that happens.
[[nodiscard]] bool isListed(const char* user, PVLIBCSZLIST list, bool& failed) {
    const int code = VLIBCErrGet(), line = VLIBCErrorGetLine();
    const char* const file = VLIBCErrorGetFile();
    VLIBCErrSetEx(0, kSource, __LINE__);
    const bool listed = BlSDKUserIsInList(user, list) != 0;
    if (VLIBCErrGet() != 0) {
        failed = true;
    } else {
        VLIBCErrSetEx(code, file, line);
    }
    return listed;
}

}  // namespace

ListMembership listsOf(const char* user, const VEXOSHARE& share, AskLists extent) {
    const bool all = extent == AskLists::kAll;
    ListMembership lists;
    lists.noAccess = isListed(user, share.naList, lists.failed) || lists.failed;
    if (all || !lists.noAccess) lists.readWrite = isListed(user, share.rwList, lists.failed);
    if (all || !(lists.noAccess || lists.readWrite)) lists.readOnly = isListed(user, share.roList, lists.failed);
    return lists;
}

bool askAdministrator(const char* user, bool& administrator) {
    const int answer = VEXOGroupIsAdminGroupMem(user);
    if (answer == -1) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s:%d VEXOGroupIsAdminGroupMem(%s) failed. [0x%04X %s:%d]", kSource, __LINE__,
               printable(user).c_str(), static_cast<unsigned>(VLIBCErrGet()), VLIBCErrorGetFile(), VLIBCErrorGetLine());
        return false;
    }
    administrator = answer == 1;
    return true;
}

bool askShare(const char* path, const char* user, const char* sid, AskLists extent, ShareFacts& facts) {
    const CString component = pathComponent(path, true);
    if (component == nullptr) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s(%d): OrvLibGetTokOfPath %s fail", kSource, __LINE__, printable(path).c_str());
        return false;
    }
    ShareRecord share;
    if (VEXOShareGet(component.get(), acquire(share)) != 0) {
        OrvLibSetErr(ORV_ERR_MISSING);
        syslog(LOG_ERR, "%s(%d): VEXOShareGet %s fail", kSource, __LINE__, printable(component.get()).c_str());
        return false;
    }
    facts.shareName = share->szName;
    facts.shareRoot = share->szPath;
    facts.mask = share->mask;
    const UserKind kind = userKindOf(user);
    if (sid != nullptr && kind != UserKind::kLocal) return askService(kind, user, sid, facts);
    facts.lists = listsOf(user, *share, extent);
    return true;
}

ShareVerdict judgeShare(const ShareFacts& facts) {
    if (facts.serviceAnswer) return {PrivilegeRule::kService, privilegeFromService(*facts.serviceAnswer)};
    const PrivilegeRule rule = ruleOf(facts.lists);
    return {rule, privilegeOf(rule)};
}

}  // namespace orvel
