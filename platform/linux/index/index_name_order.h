// The first records that satisfy a condition in the order by name.
#ifndef VEXO_LINUX_INDEX_NAME_ORDER_H
#define VEXO_LINUX_INDEX_NAME_ORDER_H

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "index/index_columns.h"
#include "index/index_condition.h"
#include "index/index_names.h"

namespace vexo::fileindex {

// Packed names and the records that came since, merged. What is asked is answered from one snapshot of the names; a
// record that is gone when its turn comes is left out. Operations that give bool give false with the slot filled.
class NameOrder {
 public:
    // `index` and `condition` must outlive it. What is not found until `end` is left out.
    NameOrder(Database& index, const Condition& condition, std::unique_ptr<const Names> names, bool descending,
              Database::Clock::time_point end);

    // Within a transaction: appends the records that follow, `most` at most.
    [[nodiscard]] bool read(size_t most, std::vector<OwnedRecord>& part);
    // There are no more, or its time is over.
    [[nodiscard]] bool atEnd() const { return atEnd_; }
    // All that satisfied the condition at the first reading were appended.
    [[nodiscard]] bool wasWhole() const { return whole_; }

 private:
    struct Found {
        OwnedRecord record;
        std::string key;
    };
    [[nodiscard]] bool readNew();
    [[nodiscard]] bool findPacked(std::optional<Found>& found);
    [[nodiscard]] Found foundIn(const Statement& statement) const;
    [[nodiscard]] bool isLate();

    Database& index_;
    const Condition& condition_;
    const std::unique_ptr<const Names> names_;
    const bool descending_;
    const Database::Clock::time_point end_;
    NamesCursor at_;
    Statement one_;
    bool begun_ = false, packedEnd_ = false, atEnd_ = false, whole_ = false;
    std::optional<Found> packed_;
    std::vector<Found> new_;  // the next one last
    unsigned looks_ = 0;
};

}  // namespace vexo::fileindex

#endif
