// Sessions of visitors who came through a sharing link: who is behind a session identifier.
//
// Both functions read the login-record file, which is root's alone: call them before the process takes on a user's
// identity. They leave the library code alone; messages go to the system log.
#ifndef ORVEL_LOGIN_RECORDS_H
#define ORVEL_LOGIN_RECORDS_H

#include "orvel/export.h"
#include "vexo/session.h"
#include "vexo/web.h"
#include "vexo/web_record.h"

// What a check grants.
struct _tag_confirm_policy {
    int flags;           // ORV_POLICY_... bits
    int keepAccessTime;  // not 0: the time of the last access stays, and a stale session stays in the file
};

enum {
    ORV_POLICY_ADMINISTRATOR = 1,  // an administrator is answered 2
    ORV_POLICY_USER = 2            // whoever passes is answered 1; without it -2
};

// Checks a session and, with it, sweeps the stale sessions of all links out of the file.
//
// A record matches by session identifier, link identifier (the name of the cookie) and client address (from the
// environment: HTTP_X_FORWARDED_FOR up to its first comma, HTTP_CLIENT_IP, REMOTE_ADDR; cut to 45 bytes); the address
// is not compared where the setting "skip_checksrcip" is "yes". The user of the record must exist, his account must not
// have ended, and for the positions 2 to 5 he must hold the application's privilege; else the record is removed. The
// record then gets the time of this access and `position`. Of several matching records the last one decides.
//
// `sid` and `link` may be null, which match nothing. 2 authorised, an administrator; 1 authorised; -1 the session is
// stale; -2 not authorised (no record matches, the check refused it, or the file could not be read); -4 a null
// `request`, `user` or `policy`, a `size` below 1, no client address, or a rewrite that failed, after which the file is
// as it was.
//
// `user` gets the name of the matching record's user, cut to size - 1 bytes, before it is known whether he passes, and
// so does the environment variable USERNAME; without a match both stay as they are. Waits up to 30 seconds for other
// processes (-2 after that). The platform's error number becomes 0x0900 for a file that could not be opened, 0x0D00 for
// a time of access below 1.
ORVEL_API int IsAuthorizedByPath(VEXO::WebCGI* request, const char* sid, char* user, int size,
                                 _tag_confirm_policy* policy, _tag_cgi_position position, const char* link);

// Looks up the user of a session: 1, with his name in `user` cut to size - 1 bytes, when a record of the request's file
// holds the cookie "id" as session identifier and `link` as link identifier; else 0, `user` unchanged: a null argument,
// a size below 1, no cookie, no such record, no access to the file. Nothing else is checked, nothing is written.
ORVEL_API int VexoCgiHasRecord(_tag_VexoCgi* request, char* user, int size, char* link);

#endif
