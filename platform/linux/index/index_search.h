// Finding records in the index of a share.
#ifndef VEXO_LINUX_INDEX_SEARCH_H
#define VEXO_LINUX_INDEX_SEARCH_H

#include <cstdint>
#include <vector>

#include "index/index_condition.h"
#include "index/index_database.h"

namespace vexo::fileindex {

// The ids of the records that satisfy the condition, ascending, by whatever way is short: the folders that it names,
// the trigrams of its names, or all records; `version` is the database's (Database::readVersion) in which they did. A
// search that `cancel` (may be null) ends finds none. False with the slot filled on failure.
[[nodiscard]] bool searchIndex(Database& index, const Condition& condition, const int* cancel,
                               std::vector<int64_t>& ids, int64_t& version);

// Whether the flag says so; null says no.
[[nodiscard]] bool isCancelled(const int* cancel);

}  // namespace vexo::fileindex

#endif
