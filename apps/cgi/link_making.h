// Publishing a path: what a logged-in user and the command-line tool ask alike.
#ifndef ORVEL_CGI_LINK_MAKING_H
#define ORVEL_CGI_LINK_MAKING_H

#include <cstdint>
#include <optional>
#include <string>

#include "public_link.h"

namespace orvel::cgi {

// What the owner says of a link; what he leaves out stays as it is.
struct LinkTerms {
    std::optional<std::string> password;  // "" for none
    std::optional<std::int64_t> available, expires;
    std::optional<std::string> note;
    std::optional<std::int64_t> most;                  // downloads, 0 for any number
    std::optional<std::int64_t> mostFiles, mostBytes;  // of a link that receives
};

// Who publishes what, and on which terms.
struct LinkWish {
    std::string user;
    std::string sid;  // "" for none
    std::string path;
    LinkTerms terms;
    std::string
        inbox{};  // visitors send files into a new folder of this name in `path`, and see nothing; "": they look
};

// Makes the link when the user may create links and may download the path, taking on his identity for the rest of the
// process. 0, or a library code: 407 he may not, or the path is neither a file nor a folder; 400 a begin without an end
// or behind it, a date out of range, a password or note that is too long, a limit that is too high, an owner whose
// sessions could not be recorded (a comma in his name); 401 a database that failed; else as for opening the path.
//
// For a link that receives he must be allowed to upload there instead. Its folder is made, under a numbered name where
// something has this one; 418 and others for a name that cannot be one.
int makeLink(const LinkWish& wish, Link& link);

// Changes a link of the user's in place, when he may still create links. Who had logged in with another password than
// the link's new one is logged out. 0, or 407, 400 and 401 as above; 408 for no such link of his.
int changeLink(const std::string& user, const std::string& id, const LinkTerms& terms, Link& link);

}  // namespace orvel::cgi

#endif
