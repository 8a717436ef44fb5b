// Records in the order that a query asks for.
#ifndef VEXO_LINUX_INDEX_ORDER_H
#define VEXO_LINUX_INDEX_ORDER_H

#include <cstdint>
#include <vector>

#include "index/index_condition.h"
#include "index/index_database.h"
#include "vexo/index.h"

namespace vexo::fileindex {

// Appends to `ids` the page that the query asks for. Sort orders of large result sets that no longer change are kept in
// the database itself, where that can be written, so that further pages need not sort. False with the slot filled on
// failure.
[[nodiscard]] bool selectPage(Database& database, const FIQUERY& query, std::vector<int64_t>& ids);

}  // namespace vexo::fileindex

#endif
