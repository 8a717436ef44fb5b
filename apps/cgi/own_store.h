// Files that the programs keep for a user between two requests: a folder of each user's own,
// /var/lib/vexo/<store>/<uid> below the system root, made as root when it is first needed; files in it are written as
// the user, so whoever reads one believes nothing in it.
//
// The time of a file says when it was last needed: after a while at rest it is gone, and where a user has too many the
// one at rest longest makes room. Whoever works with one holds it by a lock, and it stays as long.
#ifndef ORVEL_CGI_OWN_STORE_H
#define ORVEL_CGI_OWN_STORE_H

#include <sys/stat.h>

#include <string>
#include <string_view>

#include "base/descriptor.h"

namespace orvel::cgi {

struct OwnStore {
    const char* path;
    int mostFiles;  // of a user
    long long mostBytes;
    long long seconds;                 // at rest
    bool (*isName)(std::string_view);  // whether a file is one of the store's

    [[nodiscard]] bool isOver(const struct stat& status) const;
};

// A file in a user's folder (see user_folder.h), for reading. Null with errno.
[[nodiscard]] Descriptor openOwnFile(const Descriptor& folder, const std::string& name);
// False when somebody works with it.
bool removeUnheld(const Descriptor& folder, const std::string& name);
// Makes room for one more file of that size. The folder is locked by the caller. False when what is held leaves none.
[[nodiscard]] bool makeRoom(const OwnStore& store, const Descriptor& folder, long long bytes);

struct OwnSweep {
    long removed = 0;
    int error = 0;  // errno of the first failure; the rest was swept all the same
};
// Removes what is over and not held, of all users; and what a killed process left. As root. Where there is no store
// there is nothing to do.
[[nodiscard]] OwnSweep sweepOwn(const OwnStore& store);

}  // namespace orvel::cgi

#endif
