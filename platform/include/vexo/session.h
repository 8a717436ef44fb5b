// The web session: the web server authenticates (REMOTE_USER), the platform keeps a session for each log-in.
#ifndef VEXO_SESSION_H
#define VEXO_SESSION_H

#include <sys/types.h>

#include <string>

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

// The session of one request. The constructor reads the CGI environment: REMOTE_USER names the user that the web server
// let in; the cookie "id" names the session. A session is a file of the store (/run/vexo/sessions/<sid>) that belongs
// to root and holds the user, the address and the time of the log-in.
class VEXO_API WebMan {
 public:
    WebMan();
    ~WebMan();
    WebMan(const WebMan&) = delete;
    WebMan& operator=(const WebMan&) = delete;

    // True when the request is authenticated and its user known: the session named by the cookie when it is this user's
    // and still alive, else a new one (its cookie is then due, see GetNewCookie). `flags` and `position` select what
    // the appliance's log-in page would ask; every authenticated session satisfies them here, and so it does for any
    // `appId` (see VLIBUserPrivilegeHas). False with the slot: 0x0300 nobody let in or a store that is not ours, 0x1D00
    // unknown user, 0x0D00 a user name with control bytes, else why the session could not be written.
    bool IsAuthorized(const char* appId, int flags, _tag_cgi_position position);
    // The session's user, "" before IsAuthorized succeeded.
    std::string GetLoginUserName() const;
    // The session identifier, "" before IsAuthorized succeeded.
    std::string GetSessionId() const;
    // The header value of a cookie that the reply must set ("id=...; Path=/; HttpOnly; SameSite=Strict", and "; Secure"
    // in a request by HTTPS), "" when none.
    std::string GetNewCookie() const;

 private:
    struct Impl;
    Impl* impl_;
};

#endif
