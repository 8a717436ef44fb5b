#include "operation/judge.h"

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"

namespace orvel::cgi {

int judge(const User& user, const std::string& path, Need need) {
    const char *name = user.name.c_str(), *sid = user.sid.c_str();
    OrvLibSetErr(ORV_ERR_NONE);
    if (need == Need::kList) {
        return CheckShareListPrivilege(name, sid, path.c_str()) ? ORV_ERR_NONE : lastCode(ORV_ERR_DENIED);
    }
    if (need == Need::kRead) {
        return CheckShareDownloadPrivilege(name, sid, path.c_str()) ? ORV_ERR_NONE : lastCode(ORV_ERR_DENIED);
    }
    if (IsDirUserHome(path, nullptr)) return ORV_ERR_NONE;
    int privilege = ORV_PRIVILEGE_UNKNOWN, mask = 0;
    if (OrvLibGetPrivilege(path.c_str(), name, sid, &privilege, &mask) != 0) return lastCode();
    const bool fixed = need == Need::kModify && (mask & ORV_MASK_NO_MODIFYING) != 0;
    return privilege == ORV_PRIVILEGE_READ_WRITE && !fixed ? ORV_ERR_NONE : ORV_ERR_DENIED;
}

}  // namespace orvel::cgi
