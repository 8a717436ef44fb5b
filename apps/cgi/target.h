// A name in a folder of a share, where something is about to be made, moved or removed.
#ifndef ORVEL_CGI_TARGET_H
#define ORVEL_CGI_TARGET_H

#include <string>

#include "confined.h"
#include "descriptor.h"
#include "orvel/file_info.h"

namespace orvel::cgi {

struct Target {
    Descriptor folder;  // opened O_PATH, beneath the share root
    std::string name;   // one component; need not exist
};

// Opens the folder that holds what `info` resolved to, as the calling identity. With `makeFolders` missing ones are
// made on the way, each with a name that may be used, owned by `user` also when the process acts as root. 0; 400 for a
// share root or a path that ends in "..", else a code as for confinedFolder, of OrvCheckFileName or of the making.
int openTarget(const PathInfo& info, LinkPolicy policy, const std::string& user, bool makeFolders, Target& target);

// Makes the folder `name` in `folder`, owned as above, and opens it O_PATH. EEXIST gives 414.
int makeFolder(const Descriptor& folder, const std::string& name, const std::string& user, Descriptor& made);

}  // namespace orvel::cgi

#endif
