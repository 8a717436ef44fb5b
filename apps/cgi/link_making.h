// Publishing a path: what a logged-in user and the command-line tool ask alike.
#ifndef ORVEL_CGI_LINK_MAKING_H
#define ORVEL_CGI_LINK_MAKING_H

#include <string>

#include "public_link.h"

namespace orvel::cgi {

// Who publishes what, and for how long.
struct LinkWish {
    std::string user;
    std::string sid;  // "" for none
    std::string path;
    std::string password;  // "" for none
    std::int64_t available = 0;
    std::int64_t expires = 0;
};

// Makes the link when the user may create links and may download the path, taking on his identity for the rest of the
// process. 0, or a library code: 407 he may not, or the path is neither a file nor a folder; 400 a begin without an end
// or behind it, a date out of range, a password that is too long, an owner whose sessions could not be recorded (a
// comma in his name); 401 a database that failed; else as for opening the path.
int makeLink(const LinkWish& wish, Link& link);

}  // namespace orvel::cgi

#endif
