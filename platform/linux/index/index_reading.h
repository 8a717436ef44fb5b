// Reading chosen records in parts, so that no database is held while a caller looks at them.
#ifndef VEXO_LINUX_INDEX_READING_H
#define VEXO_LINUX_INDEX_READING_H

#include <cstdint>
#include <vector>

#include "index/index_columns.h"
#include "index/index_database.h"

namespace vexo::fileindex {

class PartReader {
 public:
    explicit PartReader(const std::vector<int64_t>& ids) : ids_(ids) {}
    [[nodiscard]] bool atEnd() const { return next_ == ids_.size(); }
    // The next records, in the order of the ids; those that are gone by now are left out. False with the slot filled.
    [[nodiscard]] bool read(Database& database, std::vector<OwnedRecord>& part);

 private:
    [[nodiscard]] bool readRecords(Database& database, std::vector<OwnedRecord>& part);

    const std::vector<int64_t>& ids_;
    size_t next_ = 0;
};

}  // namespace vexo::fileindex

#endif
