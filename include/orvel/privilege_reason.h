// Why a user may or may not use a path: the facts behind a share privilege, for people to read.
#ifndef ORVEL_PRIVILEGE_REASON_H
#define ORVEL_PRIVILEGE_REASON_H

#include <string>

#include "orvel/export.h"

// Which rule gave the privilege.
enum class PrivilegeRule {
    kHome,       // a home folder: exempt from share privileges
    kNoAccess,   // the share's no-access list
    kReadWrite,  // its read-write list
    kReadOnly,   // its read-only list
    kNoList,     // in none of the lists
    kService     // the domain's or directory server's privilege service
};

struct PrivilegeReason {
    std::string shareName;
    std::string shareRoot;  // for a home, the home folder
    PrivilegeRule rule = PrivilegeRule::kNoList;
    bool administrator = false;
    // Which of the share's lists the user is in; all three are asked, though the first in this order decides. A
    // membership that could not be looked up counts as one in the no-access list.
    bool inNoAccessList = false;
    bool inReadWriteList = false;
    bool inReadOnlyList = false;
    int privilege = -1;          // 0, 1, 2 as OrvLibGetPrivilege answers; -1 for a home, which has none
    unsigned shareMask = 0;      // as the share has it
    unsigned effectiveMask = 0;  // what binds this user; administrators are free of it

    std::string realPath;
    std::string fsType;     // name of the file system's type, "unknown" for one that the platform has no name for
    bool remote = false;    // on a network mount: the file itself is not looked at, its server may be dead
    bool readOnly = false;  // on a read-only mount
    bool exists = false;    // as far as the calling identity can see, and the path leads nowhere outside the share
    unsigned aclBits = 0;   // of the calling identity, as GetACLPrivilege; 0 when the file does not exist
};

// Fills `reason` for `user` and the share-relative `path`; `sid` as for OrvLibGetPrivilege. The permission bits are
// those of the calling identity: switch to the user first to see the user's. True; false with the library code of the
// step that failed (as OrvLibGetPrivilege, then OrvFullPathGet), `reason` holding what was found until then.
ORVEL_API bool ExplainPrivilege(const char* path, const char* user, const char* sid, PrivilegeReason& reason);

#endif
