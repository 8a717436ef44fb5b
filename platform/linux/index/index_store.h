// The central store of the shares' indexes, docs/formats/index.md.
#ifndef VEXO_LINUX_INDEX_STORE_H
#define VEXO_LINUX_INDEX_STORE_H

#include <memory>
#include <string>
#include <string_view>

#include "index/index_database.h"
#include "index/index_names.h"

namespace vexo::fileindex {

// What the files of a share are called in the store: its name folded, so that it is found however it is written.
[[nodiscard]] std::string storeName(std::string_view share);
// Where the share's index lies.
[[nodiscard]] std::string indexPath(std::string_view share);

// The share's index for reading. Null with the slot filled, 0x0600 when there is none. The caller has raised.
[[nodiscard]] std::unique_ptr<Database> openIndex(std::string_view share);
// The names of that index in their order; null where they are not kept. The caller has raised.
[[nodiscard]] std::unique_ptr<const Names> openNames(std::string_view share, Database& index);

}  // namespace vexo::fileindex

#endif
