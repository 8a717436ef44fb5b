// Which chosen folders an index can answer for.
#ifndef ORVEL_SEARCH_INDEXED_FOLDER_H
#define ORVEL_SEARCH_INDEXED_FOLDER_H

#include "orvel/file_info.h"

namespace orvel {

// Whether the index of the folder's share holds what lies in it. An index is made by a walk of the share, so it knows
// nothing of folders reached through links, of hidden ones, of network mounts and of the share's recycle bin, and knows
// each other folder by one spelling of its path.
[[nodiscard]] bool indexHolds(const PathInfo& folder);

}  // namespace orvel

#endif
