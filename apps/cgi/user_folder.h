// A folder of each user's own below a store of the system's: nobody else can read or change what lies in it.
#ifndef ORVEL_CGI_USER_FOLDER_H
#define ORVEL_CGI_USER_FOLDER_H

#include <string>

#include "base/descriptor.h"

namespace orvel::cgi {

// Opens the folder of `user` in `store` (below the system root), "<store>/<uid>", 0700; with `make` both are made when
// they are missing. The process has the user's identity. Empty with errno: EACCES for one that others may enter.
[[nodiscard]] Descriptor openUserFolder(const char* store, const std::string& user, bool make);

}  // namespace orvel::cgi

#endif
