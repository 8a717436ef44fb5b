// What a user may do: share privileges, restriction masks, ACL permissions, and permission texts.
//
// A share privilege comes from the share's user lists or, for a domain or directory user with a session, from the
// platform's privilege services. Home folders are exempt from share privileges. The restriction mask of a share binds
// everybody but administrators. Failures are logged at LOG_ERR where a function does not say otherwise; user and path
// arguments are UTF-8 text, paths share-relative unless they are called real.
#ifndef ORVEL_PRIVILEGE_H
#define ORVEL_PRIVILEGE_H

#include <string>

#include "orvel/export.h"
#include "vexo/list.h"

enum {
    ORV_PRIVILEGE_UNKNOWN = -1,  // what an output holds before, and after a failed, look-up
    ORV_PRIVILEGE_NONE = 0,
    ORV_PRIVILEGE_READ = 1,
    ORV_PRIVILEGE_READ_WRITE = 2
};

// Bits of a restriction mask.
enum {
    ORV_MASK_NO_LISTING = 0x1,    // no listing, no download
    ORV_MASK_NO_MODIFYING = 0x2,  // existing files stay as they are
    ORV_MASK_NO_DOWNLOAD = 0x4
};

// What ACLAccess can be asked for; numbers of their own, not the bits of GetACLPrivilege.
enum {
    ORV_ACCESS_READ = 1,
    ORV_ACCESS_WRITE = 2,
    ORV_ACCESS_EXECUTE = 4,
    ORV_ACCESS_DELETE = 8,
    ORV_ACCESS_APPEND = 16
};

// How an upload treats a target that exists. Any nonzero value means that the caller has chosen.
enum _tag__type_ : int { OVERWRITE_MODE_ERROR = 0, OVERWRITE_MODE_OVERWRITE = 1, OVERWRITE_MODE_SKIP = 2 };

// The privilege of `user` on the share of `path`. `sid` is the login session; null: domain and directory users are
// judged by the share's lists, like local ones. Returns 0 with `*privilege` (0, 1 or 2) and `*restrictionMask` (0 for
// an administrator; may be null). Returns -1 with 401 when membership of the administrators group is unknown (asked
// first, even of nulls), an argument is null or there is no first component, 408 when the share cannot be read, 402
// when a privilege service failed, 406 when its server was not reached; `*privilege` is -1 then, the mask unchanged.
// Not logged: 402 and 406.
ORVEL_API int OrvLibGetPrivilege(const char* path, const char* user, const char* sid, int* privilege,
                                 int* restrictionMask);

// 1 when the user's privilege is exactly `wanted` (1 is not implied by 2), 0 when not, -1 on failure with the code of
// OrvLibGetPrivilege, or 401 for a null `path` or `user`. Stores 0 first.
ORVEL_API int OrvLibHasPrivilege(const char* path, const char* user, const char* sid, int wanted);

// May the folder be listed: always in a home; elsewhere with a privilege and without mask bit 0x1. A refusal and a null
// `path` set no code; a failed look-up leaves the code of OrvLibGetPrivilege.
ORVEL_API bool CheckShareListPrivilege(const char* user, const char* sid, const char* path);

// May files be downloaded: as above, and without mask bit 0x4. Sets 407 on a refusal, 400 for a null `path`.
ORVEL_API bool CheckShareDownloadPrivilege(const char* user, const char* sid, const char* path);

// May the user upload to the target file `path`: needs read-write. Where mask bit 0x1 or 0x2 is set `overwriteMode`
// becomes 2 and the target is not looked at; else, in mode 0, the target must not exist. False with 400 null path, 407
// no privilege, 414 target exists, or the code of the look-up or resolution that failed.
ORVEL_API bool CheckShareUploadPrivilege(const char* user, const char* sid, const char* path,
                                         _tag__type_& overwriteMode);

// Can the calling identity enter and open the real directory, looked up once; "/proc/self/fd/N" stands for a folder
// that the caller holds open, and messages name it by where it lies. Side effect: on success, and after a failed open,
// the working directory of the process is this one; callers rely on it. Stores 0 first (not for null, which is false);
// false with 408 missing or no folder, 407 denied, 402 else.
ORVEL_API bool CheckDirListPrivilege(const char* realDir);

// 0 when the calling identity holds every permission in `requested` (ORV_ACCESS_... bits) on the real path, or no ACL
// applies to it. -1 with 407 when one is missing (the platform error is 0x0300 then), 411 read-only file system, 408
// missing; without a code for a null path, `requested` 0 or another failure. Logged: that other failure alone.
ORVEL_API int ACLAccess(const char* realPath, int requested);

// The ACL permission bits of the calling identity on the real path: 0x1 execute, 0x2 write, 0x4 read, 0x8 append, 0x200
// delete; 0x1FFF (every bit) when they cannot be read. Logs failures other than a denial or a missing target; sets no
// code.
ORVEL_API unsigned int GetACLPrivilege(const char* realPath);

// The names of the shares whose lists let `user` in (write, when `writableOnly` is nonzero), without hidden ones; in
// order of the definitions, or ascending without case when `sort` is nonzero. Administrators and privilege services are
// not asked. The caller gives the list back with VLIBCSzListFree. Stores 0; null with 401 on failure.
ORVEL_API PVLIBCSZLIST OrvLibValidShareGen(const char* user, int sort, int writableOnly);

// The nine characters "rwxr-x---" of the low nine mode bits. Special bits do not show.
ORVEL_API std::string GetPrivilegeStr(unsigned int mode);

// The octal digits of the permissions as a decimal number: 755 for "rwxr-xr-x" or for mode 0755. A text that is null or
// ends early lacks the permissions that it does not show.
ORVEL_API int GetPrivilege(const char* permString);
ORVEL_API int GetPrivilege(unsigned int mode);

#endif
