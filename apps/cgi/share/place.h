// What a visitor of a public link may reach: the shared file, or the shared folder and what lies below it.
#ifndef ORVEL_CGI_SHARE_PLACE_H
#define ORVEL_CGI_SHARE_PLACE_H

#include <string>

#include "base/descriptor.h"

namespace orvel::cgi {

struct Place {
    Descriptor found;      // opened O_PATH
    bool isFile = false;   // the link is to a file
    std::string realPath;  // free of links
    std::string path;      // share-relative, with the owner's name for the share
    std::string within;    // path below the shared folder, "" for itself; free of links
    std::string name;      // to be shown and saved under
};

// Finds `wanted`, a path below the shared one ("" or "/" for itself), as the owner, whose identity the process has. No
// link and no ".." leads out of the shared folder, and a link to a file is that file alone. 0 or a library code.
int findPlace(const std::string& owner, const std::string& sharedPath, const std::string& wanted, Place& place);

}  // namespace orvel::cgi

#endif
