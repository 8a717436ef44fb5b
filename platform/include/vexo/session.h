// The web session: made by a log-in (vexo/login.h), or on the word of a web server that authenticates.
#ifndef VEXO_SESSION_H
#define VEXO_SESSION_H

#include <sys/types.h>

#include <string>
#include <vector>

#include "vexo/export.h"

// Which application a session is asked for.
enum _tag_cgi_position {
    CGI_POSITION_NONE = 0,
    CGI_POSITION_DESKTOP = 1,
    CGI_POSITION_FILE_MANAGER = 2,
    CGI_POSITION_AUDIO = 3,
    CGI_POSITION_SURVEILLANCE = 4,
    CGI_POSITION_DOWNLOAD = 5
};

VEXO_BEGIN_C
// Ids of the user of session `sid`, from the session store and then the user source; counts as a use of the session.
// 0xFFFFFFFF on failure: 0x1D00 unknown user, 0x0300 when the session is another user's, unknown or ended, 0x0D00 for
// a null argument or an empty user.
VEXO_API uid_t VexoCgiUIDGet(const char* sid, const char* user);
VEXO_API gid_t VexoCgiGIDGet(const char* sid, const char* user);
VEXO_END_C

// One of the sessions in which a user is logged in.
struct WebSession {
    std::string id;  // names it for LogOut, and lets nobody in
    std::string address, browser;
    long long since, used;  // seconds since 1970; a use is noted once a minute
    bool current;           // this request's
};

// The session of one request. The constructor reads the CGI environment: the cookie "id" (by HTTPS "__Host-id") names
// the session; REMOTE_USER names the user that the web server let in, and counts where the setting "trusted_log_in" is
// "yes"; with a header Orvel-Idle the request is no use of the session. A session is a file of the store
// (/run/vexo/sessions/<sid>) that belongs to root, see formats/session.md.
class VEXO_API WebMan {
 public:
    WebMan();
    ~WebMan();
    WebMan(const WebMan&) = delete;
    WebMan& operator=(const WebMan&) = delete;

    // True when the request is authenticated and its user known. On a web server's word: by the session named by the
    // cookie when it is this user's and alive, else a new one (its cookie is then due, see GetNewCookie). Without it:
    // by the session named by the cookie if a log-in made it and its user may still log in (VEXOLogInAllowed); the
    // session of a user who may not, or of an account made anew under the name, ends. `flags` and `position` select
    // what the appliance's log-in page would ask; every authenticated session satisfies them here, and so it does for
    // any `appId` (see VLIBUserPrivilegeHas). False with the slot: 0x0300 nobody let in or a store that is not ours,
    // 0x1D00 unknown user, 0x0D00 a user name with control bytes, else why the session could not be written.
    bool IsAuthorized(const char* appId, int flags, _tag_cgi_position position);
    // Begins a session for `user`, with whom a log-in ended, and ends the one that the cookie named: its cookie is due.
    // False with the slot, as above.
    bool LogIn(const std::string& user);
    // Ends sessions of the user: "this", "others" (all that log-ins made but this), "all", or one by its name. How many
    // ended. After "this", "all" and the own name a cookie that removes the browser's is due.
    int LogOut(const std::string& which);
    // Where the user is logged in, last used first.
    std::vector<WebSession> Sessions() const;
    // The session's user, "" before IsAuthorized succeeded.
    std::string GetLoginUserName() const;
    // The session identifier, "" before IsAuthorized succeeded.
    std::string GetSessionId() const;
    // The header value of a cookie that the reply must set ("id=...; Path=/; HttpOnly; SameSite=Strict"; in a request
    // by HTTPS "__Host-id=..." with "; Secure"), "" when none.
    std::string GetNewCookie() const;

 private:
    struct Impl;
    Impl* impl_;
};

#endif
