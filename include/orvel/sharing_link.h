// A visitor who comes through a public sharing link.
#ifndef ORVEL_SHARING_LINK_H
#define ORVEL_SHARING_LINK_H

#include <string>

#include "orvel/export.h"
#include "orvel/login_records.h"
#include "vexo/session.h"
#include "vexo/web.h"

// Who logs in, and what is allowed. Texts are the caller's.
struct _tag_login_params {
    const char* user;      // the link's owner
    const char* password;  // must be there; nothing compares it
    const char* service;
    int allowedKinds;  // ORV_LOGIN_... bits
    int neverExpires;  // not 0: the session never goes stale
};

enum {
    ORV_LOGIN_ADMINISTRATOR = 1,  // an administrator needs it, beside the bit of a domain or directory account
    ORV_LOGIN_LOCAL = 2,          // a local account that is no administrator's
    ORV_LOGIN_DOMAIN = 4,         // a domain account
    ORV_LOGIN_DIRECTORY = 8       // an account of a directory server
};

namespace OrvelLogin {

// One object a request; it holds the name of the logged-in user. Call it before the process takes on a user's identity:
// the record file is root's. No member sets the library code; failures go to the system log.
//
// The link of a request is the environment variable HTTP_FOLDER_SHARING, else the parameter FOLDER_SHARING.
class ORVEL_API FolderSharingLoginManager {
 public:
    // The shared path of the request's link as its creator stored it; "" without a link, without a row for it, with a
    // row that has no user or no path, and when the database could not be asked. A link that is out of its window is
    // logged, and its path is returned all the same (kept): a caller that must refuse it decides by other means.
    std::string GetSharingFolderPath(VEXO::WebCGI& cgi) const;

    // Is the visitor logged in through the link whose identifier names the cookie? -5 without that cookie, `user`
    // untouched; else what IsAuthorizedByPath answers for its value. The name that then stands in `user` becomes the
    // logged-in user's, also after a check that failed: start with an empty buffer.
    int isAuthorized(VEXO::WebCGI* cgi, char* user, int size, _tag_confirm_policy* policy, _tag_cgi_position position,
                     const char* cookieName);
    // The same for a link identifier, and for the link of the request (false without one).
    bool isAuthorized(VEXO::WebCGI& cgi, const std::string& link);
    bool isAuthorized(VEXO::WebCGI& cgi);

    // True when the visitor is logged in already or has been now, under the name of the link's owner; the reply's
    // header then sets a cookie named by the link. Nothing is asked about a password or the link's window.
    bool folderSharingLogin(VEXO::WebCGI& cgi, const std::string& link, const std::string& owner);

    // Makes a session: its identifier into `session` (may be null), cut to size - 1 bytes, and as a cookie named `link`
    // (null counts as "") into the reply's header. 1 done, even if the cookie alone could not be added; -3 the
    // client's address is denied or the kind of account not allowed; -4 a null argument, no client address, or no
    // record could be made. Takes a second at least. Success clears the failures of the address. A null `session`, or a
    // `size` below 1, gets nothing.
    int login(VEXO::WebCGI* cgi, char* session, int size, _tag_login_params* params, const char* link);

    // Counts one failed attempt of the client's address at the service "FOLDER_SHARING".
    void folderSharingFailLoginSet();

    std::string GetLoginUserName() const;

    // Writes the header and the page that loads the visitor's scripts to standard output, and flushes it.
    //
    // `checkValue` stands in the page as it is; of `folderPath` only quotes and backslashes are escaped, and of its
    // title nothing; the parameter "tunnel" of the request, in front of every address, is not escaped either (kept: the
    // page is fixed). The caller sees to it that none of the three can end a script, an attribute or the title. The
    // parameter "noCache", when not empty, adds a random number to the addresses of styles and scripts. Memory that
    // runs out leaves standard output untouched.
    void WriteWebPage(VEXO::WebCGI& cgi, const std::string& checkValue, const std::string& folderPath);

 private:
    std::string loginUser_;
};

// Is a link valid at `now`? The dates are those of its row, seconds since 1970: valid from `available` on, and through
// the whole of the day of which `expires` is the first or the last second; an `expires` of 0 means always. What
// GetSharingFolderPath only logs.
ORVEL_API bool IsLinkOpen(long long available, long long expires, long long now);

}  // namespace OrvelLogin

#endif
