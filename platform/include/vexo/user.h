// Users and groups: from NSS, or from etc/passwd and etc/group of the system root where it has both.
#ifndef VEXO_USER_H
#define VEXO_USER_H

#include <sys/types.h>

#include "vexo/export.h"
#include "vexo/list.h"

// Which source an account comes from, recognised by the spelling of its name: a backslash domain, else "@" directory
// server, else local.
enum AUTH_TYPE { AUTH_LOCAL = 0, AUTH_DOMAIN = 1, AUTH_DIRECTORY = 2 };

struct VEXOUSER {
    char szName[512];
    uid_t uid;
    gid_t gid;          // primary group
    char szHome[4096];  // root of the share "homes" + "/" + name ("/@DOMAIN/name" for a domain user); "" without that
                        // share
    int authType;       // AUTH_TYPE
    long expiry;        // day since the epoch on which the account ends; -1 never, or not for the process to know
};
typedef VEXOUSER* PVEXOUSER;

struct VEXOGROUP {
    char szName[512];
    gid_t gid;
};
typedef VEXOGROUP* PVEXOGROUP;

typedef struct VEXOUSERDB* PVEXOUSERDB;
typedef struct VEXOGROUPDB* PVEXOGROUPDB;

VEXO_BEGIN_C

// Fills a new record (the caller's, freed with VEXOUserFree). >=0, or <0 with 0x1D00 unknown, 0x8100 lookup failed (of
// a name also that of its expiry, which is root's to ask) and `*out` null. An id that was not found is remembered as
// missing for the rest of the process.
VEXO_API int VEXOUserGet(const char* name, PVEXOUSER* out);
VEXO_API int VEXOUserGetByUID(uid_t uid, PVEXOUSER* out);
VEXO_API void VEXOUserFree(PVEXOUSER user);  // null is accepted
VEXO_API int VEXOGroupGetByGID(gid_t gid, PVEXOGROUP* out);
VEXO_API void VEXOGroupFree(PVEXOGROUP group);  // null is accepted

// Ids of a name. 0, or -1 with 0x1D00; outputs unchanged on failure.
VEXO_API int VEXOUserGetUGID(const char* name, uid_t* uid, gid_t* gid);
VEXO_API int VEXOGroupGetGID(const char* name, gid_t* gid);

// 1 when the account has ended, 0 when not; -1 never expires.
VEXO_API int VEXOUserIsExpired(long expiry);

// Enumeration of one source. Open: null on failure. GetByCursor: 0 while it delivers a record into `*user` (allocated
// at the first call, when `*user` is null, and reused after; the caller frees the last), nonzero at the end. `next`
// is 1.
VEXO_API PVEXOUSERDB VEXOUserDBOpen(void);
VEXO_API int VEXOUserDBGetByCursor(PVEXOUSERDB db, PVEXOUSER* user, AUTH_TYPE type, int next);
VEXO_API void VEXOUserDBClose(PVEXOUSERDB db);
VEXO_API PVEXOGROUPDB VEXOGroupDBOpen(void);
VEXO_API int VEXOGroupDBGetByCursor(PVEXOGROUPDB db, PVEXOGROUP* group, AUTH_TYPE type, int next);
VEXO_API void VEXOGroupDBClose(PVEXOGROUPDB db);

// Appends the decimal gids of every group of `user`, the primary one first. The count, 0 none, <0 failure.
VEXO_API int VEXOGroupInfoGetgroupList(const char* user, PVLIBCSZLIST* gids, int flags);

// Membership of the administrators group, whose name is the setting "admin_group" (default "administrators"). 1 member,
// 0 not, -1 failure (0x1D00 unknown user; null is legal and gives 0x0D00).
VEXO_API int VEXOGroupIsAdminGroupMem(const char* user);
VEXO_API int VEXOGroupIsAdminGroupMemEx(const char* user, int flags);

// Nonzero when `user` is in the list: names, "@group", "+group", "&group" and "*" (everybody). Names of users compare
// without case; a group is the one that bears the name as it is spelled, and only where there is none, and the name is
// one of a domain, does case not count.
VEXO_API int BlSDKUserIsInList(const char* user, PVLIBCSZLIST list);

// Exactly 1 when `user` may use the application `appId`, else 0: file /etc/vexo/applications, lines
// `identifier: user @group ...`; an application without a line is everybody's.
VEXO_API int VLIBUserPrivilegeHas(const char* user, const char* appId);

// Sets the process's supplementary groups to those of `user` plus `gid`, as initgroups(3) does, from the platform's own
// source of users. 0, or -1 with errno (EPERM without the right to).
VEXO_API int VEXOUserInitGroups(const char* user, gid_t gid);

// Whether this process acts as `user` and as nobody else: its effective ids and all of its groups are that user's, or
// it is an administrator's and root's. One that never was root is taken as it is. 1, 0, or -1 when that cannot be told.
VEXO_API int VEXOUserOwnsProcess(const char* user);

// A character for the salt of crypt(3), by a secret of the process, for any number: a letter, a digit or ".", never
// "/", which some readers of the result take for a path.
VEXO_API char VEXOUserRandomNumMap2Seed(long number);

VEXO_END_C

#endif
