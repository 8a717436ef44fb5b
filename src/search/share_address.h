// Real paths taken apart: the root of a share, and the path within the share.
#ifndef ORVEL_SEARCH_SHARE_ADDRESS_H
#define ORVEL_SEARCH_SHARE_ADDRESS_H

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>

#include "orvel/file_record.h"

namespace orvel {

inline constexpr const char* kHomesShare = "homes";  // what "home" is, for records

[[nodiscard]] inline bool liesBelow(std::string_view path, std::string_view folder) {
    return !folder.empty() && path.size() > folder.size() && path.starts_with(folder) && path[folder.size()] == '/';
}

// Where the path within the share begins: behind `shareRoot`. Of a path that does not lie there, behind its second
// component, as that is how far roots mostly go. `within` is set for kNone alone.
[[nodiscard]] inline FileSearch::PathFault splitRealPath(std::string_view realPath, std::string_view shareRoot,
                                                         std::size_t& within) {
    if (liesBelow(realPath, shareRoot)) {
        within = shareRoot.size() + 1;
        return FileSearch::PathFault::kNone;
    }
    const std::size_t volumeEnd = realPath.find('/', 1);
    if (volumeEnd == std::string_view::npos) return FileSearch::PathFault::kNoShare;
    const std::size_t shareEnd = realPath.find('/', volumeEnd + 1);
    // A root by itself has no path within it, however long it is.
    if (shareEnd == std::string_view::npos || realPath == shareRoot) return FileSearch::PathFault::kNoPath;
    within = shareEnd + 1;
    return FileSearch::PathFault::kNone;
}

// The root of the share `share` ("homes" for homes), as it is defined or without the links in it, whichever `realPath`
// is or lies below. Where homes are in no share it is the home of `user`. "" when the path lies below neither.
[[nodiscard]] std::string rootAbove(const std::string& share, const std::string& user, const std::string& realPath);

// The path within the share of a share-relative path: what stands behind its first component.
[[nodiscard]] inline std::string_view pathWithinShare(std::string_view path) {
    const auto skipSlashes = [&] { path.remove_prefix(std::min(path.find_first_not_of('/'), path.size())); };
    skipSlashes();
    path.remove_prefix(std::min(path.find('/'), path.size()));
    skipSlashes();
    return path;
}

}  // namespace orvel

#endif
