// A name in a folder of a share, where something is about to be made, moved or removed.
#ifndef ORVEL_CGI_TARGET_H
#define ORVEL_CGI_TARGET_H

#include <string>
#include <vector>

#include "base/descriptor.h"
#include "confined.h"
#include "orvel/file_info.h"

namespace orvel::cgi {

// A folder that was made on the way to a target.
struct MadeFolder {
    Descriptor parent;
    std::string name;
};

struct Target {
    Descriptor folder;  // opened O_PATH, beneath the share root
    std::string name;   // one component; need not exist
    std::vector<MadeFolder> made;
};

// What openTarget does about folders that are missing.
enum class Missing { kRefuse, kMake };

// Opens the folder that holds what `info` resolved to, as the calling identity. Missing ones are made on the way when
// asked for, each with a name that may be used, owned by `user` even if the process acts as root. 0; 400 for a share
// root, 411 in a snapshot, 418 for a path that ends in "." or "..", else a code as for confinedFolder, of
// OrvCheckFileName or of the making; after a failure no folder made here is left.
int openTarget(const PathInfo& info, LinkPolicy policy, const std::string& user, Missing missing, Target& target);

// Opens the folder of something that must be there, be it in a snapshot. As above; 408 for what the file manager never
// shows.
int openPresent(const PathInfo& info, Target& target);

// Asks what openTarget would ask without making anything. The same codes; on 0, `target.folder` is open only when it
// exists already, and `within` is the target's path below the share root with no link in front of its name.
int previewTarget(const PathInfo& info, LinkPolicy policy, Target& target, std::string& within);

// Removes the folders made on the way, as far as they are empty: for when the target was not made after all.
void removeMadeFolders(Target& target);

// Whether something of this name may be made in the folder: 0, 411 in a snapshot, 418 for what the file manager never
// shows, or a code of OrvCheckFileName.
int checkNewName(const Descriptor& folder, const std::string& name);

// Which folder it is, also after a restart, when devices have other numbers: an inode number and the time of its birth.
// "" with errno.
std::string folderIdentity(int folder);

// Makes the folder `name` in `folder`, owned as above, and opens it. EEXIST gives 414.
int makeFolder(const Descriptor& folder, const std::string& name, const std::string& user, Descriptor& made);

}  // namespace orvel::cgi

#endif
