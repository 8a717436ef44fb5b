// Acting as the logged-in user: the switch of the process's effective ids.
//
// A program starts with root as its effective identity and switches before it touches a user's files, so that the
// kernel enforces the user's own permissions. The switch is for single-threaded processes and one way: nothing here
// switches back. Failures are logged at LOG_ERR unless said otherwise.
#ifndef ORVEL_IDENTITY_H
#define ORVEL_IDENTITY_H

#include <sys/types.h>

#include "orvel/export.h"

// Switches to `user`: group list, effective gid, then effective uid. An administrator keeps the effective uid 0, with
// the groups of his own. `sid` (may be null) is the login session; with it the ids come from the session, and from the
// user source only when the session does not give the gid. Returns 0; -1 with 400 null user, 401 lookup failed, 403
// unknown user. After a failure the process may hold a part of the new identity: end the request.
//
// 0 does not prove that the kernel allowed the change (kept: started by an ordinary user a process goes on as itself).
// A user who is no administrator and was left at uid 0 is logged; a caller started as root looks at geteuid. A group
// list that cannot be read is logged too, and leaves the process without supplementary groups.
ORVEL_API int OrvLibUGIDSet(const char* sid, const char* user);

// Sets the effective gid. `gid` may be (gid_t)-1, not known, when a `sid` is given; the session is then asked.
// Returns 0 (even if the kernel refuses the change: kept, OrvLibUGIDSet looks at the outcome); -1 with 400 for a null
// user or nothing to go by, 401 (not logged) when the session does not know the user.
ORVEL_API int OrvLibEGIDSet(const char* sid, const char* user, gid_t gid);

// Sets the effective uid: 0 for an administrator, else `uid`, or the session's answer when `uid` is (uid_t)-1.
// Returns 0 (even if the kernel refuses); -1 with 400 as above, 401 when it cannot be determined whether the user is an
// administrator, or (not logged) when the uid stays unknown.
ORVEL_API int OrvLibEUIDSet(const char* sid, const char* user, uid_t uid);

// Makes `user` the owner of `file`, with his primary group. A symbolic link is changed itself, never followed. FAT,
// network and disc-image file systems keep no owners of ours: 0 without a change.
// Returns 0; -1 when `file` is null, its file system unknown or the change refused (logged), or the user is unknown
// (not logged). Sets no library code.
ORVEL_API int OrvLibChown2Admin(const char* file, const char* user);

#endif
