#include "core/privilege_decision.h"

#include <algorithm>
#include <iterator>

#include "orvel/privilege.h"
#include "vexo/acl.h"

namespace orvel {
namespace {

struct AccessBit {
    int requested;
    unsigned permission;
};

constexpr AccessBit kAccessBits[] = {
    {ORV_ACCESS_READ, VEXO_ACL_READ},     {ORV_ACCESS_WRITE, VEXO_ACL_WRITE},   {ORV_ACCESS_EXECUTE, VEXO_ACL_EXECUTE},
    {ORV_ACCESS_DELETE, VEXO_ACL_DELETE}, {ORV_ACCESS_APPEND, VEXO_ACL_APPEND},
};

}  // namespace

PrivilegeRule ruleOf(const ListMembership& lists) {
    if (lists.noAccess) return PrivilegeRule::kNoAccess;
    if (lists.readWrite) return PrivilegeRule::kReadWrite;
    if (lists.readOnly) return PrivilegeRule::kReadOnly;
    return PrivilegeRule::kNoList;
}

int privilegeOf(PrivilegeRule listRule) {
    if (listRule == PrivilegeRule::kReadWrite) return ORV_PRIVILEGE_READ_WRITE;
    return listRule == PrivilegeRule::kReadOnly ? ORV_PRIVILEGE_READ : ORV_PRIVILEGE_NONE;
}

int privilegeFromService(int answer) {
    return answer == ORV_PRIVILEGE_READ || answer == ORV_PRIVILEGE_READ_WRITE ? answer : ORV_PRIVILEGE_NONE;
}

unsigned effectiveMask(bool administrator, unsigned shareMask) {
    return administrator ? 0 : shareMask;
}

bool mayList(int privilege, unsigned mask) {
    return privilege != ORV_PRIVILEGE_NONE && (mask & ORV_MASK_NO_LISTING) == 0;
}

bool mayDownload(int privilege, unsigned mask) {
    return mayList(privilege, mask) && (mask & ORV_MASK_NO_DOWNLOAD) == 0;
}

UploadVerdict judgeUpload(int privilege, unsigned mask) {
    if (privilege != ORV_PRIVILEGE_READ_WRITE) return UploadVerdict::kRefused;
    const bool restricted = (mask & (ORV_MASK_NO_LISTING | ORV_MASK_NO_MODIFYING)) != 0;
    return restricted ? UploadVerdict::kGranted : UploadVerdict::kAskTarget;
}

bool aclGrants(unsigned permission, int requested) {
    return std::none_of(std::begin(kAccessBits), std::end(kAccessBits), [&](const AccessBit& bit) {
        return (requested & bit.requested) != 0 && (permission & bit.permission) == 0;
    });
}

}  // namespace orvel
