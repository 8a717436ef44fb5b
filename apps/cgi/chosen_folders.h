// The folders of a search.
#ifndef ORVEL_CGI_CHOSEN_FOLDERS_H
#define ORVEL_CGI_CHOSEN_FOLDERS_H

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "request.h"

namespace orvel::cgi {

// Puts the share-relative paths of the folders at `paths` into `folders`, with the share's name as it is defined and
// without links, "." and "..": results of a walk then have the paths that an index has. Folders that the user may not
// list, or that lie outside their share, are left out. The temporary folders of their volumes, where results go, are
// made safe on the way. The process has the user's identity. 0; 407 when none is left, else the code of the path that
// cannot be resolved, then in `culprit`.
int chooseFolders(const User& user, const std::vector<std::string>& paths, std::vector<std::string>& folders,
                  std::string& culprit);

// The index that answers for a share.
struct UsedIndex {
    int64_t updated = 0;  // when it was last brought in step with the files
    bool live = false;    // it is kept in step
};

// The shares that the folders lie in ("homes" for home folders), and the file index that answers for them, if any.
std::map<std::string, std::optional<UsedIndex>> searchedShares(const std::vector<std::string>& folders);

// Those of the folders which are answered from an index although network mounts lie below them: no index holds what
// lies on these.
std::vector<std::string> foldersWithoutMounts(const std::string& user, const std::vector<std::string>& folders);

// Whether one of the paths lies in the user's home.
bool anyHome(const std::vector<std::string>& paths);

}  // namespace orvel::cgi

#endif
