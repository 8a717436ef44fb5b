// Finding records in the index of a share.
#ifndef VEXO_LINUX_INDEX_SEARCH_H
#define VEXO_LINUX_INDEX_SEARCH_H

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "index/index_columns.h"
#include "index/index_condition.h"
#include "index/index_database.h"
#include "index/index_name_order.h"

namespace vexo::fileindex {

// The records that satisfy a condition, by whatever way is short: the folders that it names, the trigrams of its names,
// or all records. They are read in parts, so that the index is not held while a caller looks at them. A record that is
// written anew between two parts gets a new id, higher than all others: since all ids from the first part's on are read
// at the end, none is missed. Operations give false with the slot filled on failure.
class IndexSearch {
 public:
    // `cancel` may be null; a search that it ends has no further records, which is no failure.
    IndexSearch(Database& index, const Condition& condition, const int* cancel);
    ~IndexSearch();
    IndexSearch(const IndexSearch&) = delete;
    IndexSearch& operator=(const IndexSearch&) = delete;

    // Chooses the way. Where much has to be looked at, and `names` are there, those come first that are the first in
    // their order; they may be read once more among the rest.
    [[nodiscard]] bool begin(std::unique_ptr<const Names> names, bool descending);
    // So little has to be looked at that it may be done before the first rows are shown.
    [[nodiscard]] bool isShort() const { return isShort_; }
    // What is read next is the next in the order by name.
    [[nodiscard]] bool readsInOrder() const { return order_.has_value(); }
    void endOrder() { order_.reset(); }
    // Appends the records that follow, `most` of them at most; there may be more though none was appended.
    [[nodiscard]] bool read(size_t most, std::vector<OwnedRecord>& part);
    [[nodiscard]] bool atEnd() const { return atEnd_; }

 private:
    template <class Work>
    [[nodiscard]] bool inTransaction(Work work);
    [[nodiscard]] bool chooseWay();
    [[nodiscard]] bool readOrder(size_t most, std::vector<OwnedRecord>& part);
    [[nodiscard]] bool readChosen(size_t most, std::vector<OwnedRecord>& part);
    [[nodiscard]] bool readAll(size_t most, std::vector<OwnedRecord>& part);

    Database& index_;
    const Condition& condition_;
    const int* cancel_;
    std::vector<int64_t> chosen_;  // ids to look at first
    size_t next_ = 0;              // of them
    int64_t after_ = 0;            // the records with higher ids follow
    int64_t highest_ = 0;          // id at the beginning
    std::optional<NameOrder> order_;
    bool atEnd_ = false;
    bool isShort_ = false;
    Statement one_, some_, last_;
};

// A statement for the records that satisfy the condition and another one on their ids, whose values come behind.
[[nodiscard]] bool prepareRecords(Database& index, const Condition& condition, const char* ids, Statement& statement);

// Whether the flag says so; null says no.
[[nodiscard]] bool isCancelled(const int* cancel);

}  // namespace vexo::fileindex

#endif
