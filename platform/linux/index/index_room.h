// How much room a user's results may take.
#ifndef VEXO_LINUX_INDEX_ROOM_H
#define VEXO_LINUX_INDEX_ROOM_H

#include <cstdint>
#include <string>

namespace vexo::fileindex {

// Bytes that the result database at `path` may come to: what the setting "search_results_mib" (1,024 without it) leaves
// beside the other files that its folder holds of the calling identity. 0 when the folder cannot be read.
[[nodiscard]] int64_t roomForResults(const std::string& path);

}  // namespace vexo::fileindex

#endif
