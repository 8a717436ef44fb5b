// The rules of share privileges and permissions: facts in, verdict out; nothing is asked of the outside.
#ifndef ORVEL_CORE_PRIVILEGE_DECISION_H
#define ORVEL_CORE_PRIVILEGE_DECISION_H

#include "orvel/privilege_reason.h"

namespace orvel {

// In which of a share's lists a user is.
struct ListMembership {
    bool noAccess = false;
    bool readWrite = false;
    bool readOnly = false;
    bool failed = false;  // a list could not be asked: it counts as naming the user where that denies, else as not
};

// No access wins over read-write, read-write over read-only.
[[nodiscard]] PrivilegeRule ruleOf(const ListMembership& lists);
[[nodiscard]] int privilegeOf(PrivilegeRule listRule);

// What a privilege service answered: anything but 1 and 2 is no access.
[[nodiscard]] int privilegeFromService(int answer);

// Administrators are free of a share's mask; their membership gives them no privilege.
[[nodiscard]] unsigned effectiveMask(bool administrator, unsigned shareMask);

[[nodiscard]] bool mayList(int privilege, unsigned mask);
[[nodiscard]] bool mayDownload(int privilege, unsigned mask);

enum class UploadVerdict {
    kRefused,
    kGranted,   // whatever the target is
    kAskTarget  // by the overwrite mode and whether the target exists
};
[[nodiscard]] UploadVerdict judgeUpload(int privilege, unsigned mask);

// Whether the permission bits of a file hold everything in `requested` (ORV_ACCESS_... bits).
[[nodiscard]] bool aclGrants(unsigned permission, int requested);

}  // namespace orvel

#endif
