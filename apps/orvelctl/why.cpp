#include <cstdio>

#include "arguments.h"
#include "command.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/privilege_reason.h"
#include "orvel/share_path.h"
#include "vexo/acl.h"

namespace orvel::ctl {
namespace {

const char* ruleText(PrivilegeRule rule) {
    switch (rule) {
        case PrivilegeRule::kHome:
            return "a home folder is exempt from share rights";
        case PrivilegeRule::kNoAccess:
            return "the no-access list, which beats the others";
        case PrivilegeRule::kReadWrite:
            return "the read-write list";
        case PrivilegeRule::kReadOnly:
            return "the read-only list";
        case PrivilegeRule::kNoList:
            return "in none of the share's lists";
        case PrivilegeRule::kService:
            return "the domain's or directory server's privilege service";
    }
    return "?";
}

std::string privilegeText(int privilege) {
    switch (privilege) {
        case ORV_PRIVILEGE_NONE:
            return "no access";
        case ORV_PRIVILEGE_READ:
            return "read-only";
        case ORV_PRIVILEGE_READ_WRITE:
            return "read-write";
        default:
            return "not asked";
    }
}

std::string listText(const PrivilegeReason& reason) {
    std::string text;
    if (reason.inNoAccessList) text += " no-access";
    if (reason.inReadWriteList) text += " read-write";
    if (reason.inReadOnlyList) text += " read-only";
    return text.empty() ? " none" : text;
}

std::string maskText(unsigned mask) {
    std::string text;
    if ((mask & ORV_MASK_NO_LISTING) != 0) text += " no-listing-or-download";
    if ((mask & ORV_MASK_NO_MODIFYING) != 0) text += " no-modifying";
    if ((mask & ORV_MASK_NO_DOWNLOAD) != 0) text += " no-download";
    return text.empty() ? " none" : text;
}

std::string aclText(unsigned bits) {
    std::string text;
    if ((bits & VEXO_ACL_READ) != 0) text += " read";
    if ((bits & VEXO_ACL_WRITE) != 0) text += " write";
    if ((bits & VEXO_ACL_EXECUTE) != 0) text += " enter";
    if ((bits & VEXO_ACL_DELETE) != 0) text += " delete";
    if ((bits & VEXO_ACL_APPEND) != 0) text += " append";
    return text.empty() ? " none" : text;
}

std::string mountText(const PrivilegeReason& reason) {
    return " " + (reason.fsType.empty() ? std::string("type unknown") : reason.fsType) +
           (reason.remote ? ", network" : "") + (reason.readOnly ? ", read-only" : "");
}

void print(const char* label, const std::string& text) {
    printf("%-14s%s\n", label, text.c_str());
}

void printReason(const PrivilegeReason& reason, bool mayList) {
    const bool home = reason.rule == PrivilegeRule::kHome;
    print("share", " " + terminalText(reason.shareName) + " at " + terminalText(reason.shareRoot));
    if (!home) print("in lists", listText(reason));
    print("decided by", std::string(" ") + ruleText(reason.rule));
    if (!home) {
        print("share right", " " + privilegeText(reason.privilege));
        print("restrictions", maskText(reason.shareMask) +
                                  (reason.administrator && reason.shareMask != 0 ? ", lifted: administrator" : ""));
    }
    print("may list", mayList ? " yes, as far as the share goes" : " no");
    print("real path", " " + terminalText(reason.realPath) + (reason.exists ? "" : "  (missing, or out of sight)"));
    print("mounted as", mountText(reason));
    if (reason.exists) print("permissions", aclText(reason.aclBits));
}

}  // namespace

int why(const std::vector<std::string>& words) {
    const Arguments arguments(words, "why", "", 1);
    const std::string user = arguments.required("--user");
    const std::string& path = arguments.position(0);
    int code = becomeUser(user, IsDirUserHome(path, nullptr));
    if (code != 0) return refused(path, code);
    PrivilegeReason reason;
    if (!ExplainPrivilege(path.c_str(), user.c_str(), nullptr, reason)) return refused(path, OrvLibGetErr());
    printReason(reason, CheckShareListPrivilege(user.c_str(), nullptr, path.c_str()));
    return 0;
}

}  // namespace orvel::ctl
