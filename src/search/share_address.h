// Real paths taken apart by position: "/<volume>/<share>/<path within the share>".
#ifndef ORVEL_SEARCH_SHARE_ADDRESS_H
#define ORVEL_SEARCH_SHARE_ADDRESS_H

#include <algorithm>
#include <cstddef>
#include <string_view>

#include "orvel/file_record.h"

namespace orvel {

inline constexpr const char* kHomesShare = "homes";  // what "home" is, for records

// Where the path within the share begins. `within` is set for kNone alone.
[[nodiscard]] inline FileSearch::PathFault splitRealPath(std::string_view realPath, std::size_t& within) {
    const std::size_t volumeEnd = realPath.find('/', 1);
    if (volumeEnd == std::string_view::npos) return FileSearch::PathFault::kNoShare;
    const std::size_t shareEnd = realPath.find('/', volumeEnd + 1);
    if (shareEnd == std::string_view::npos) return FileSearch::PathFault::kNoPath;
    within = shareEnd + 1;
    return FileSearch::PathFault::kNone;
}

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
