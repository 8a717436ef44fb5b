// Finding records in the index of a share.
#ifndef VEXO_LINUX_INDEX_SEARCH_H
#define VEXO_LINUX_INDEX_SEARCH_H

#include <cstdint>
#include <vector>

#include "index/index_columns.h"
#include "index/index_condition.h"
#include "index/index_database.h"

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

    // Chooses the way.
    [[nodiscard]] bool begin();
    // Appends the records that follow, `most` of them at most; there may be more though none was appended.
    [[nodiscard]] bool read(size_t most, std::vector<OwnedRecord>& part);
    [[nodiscard]] bool atEnd() const { return atEnd_; }

 private:
    template <class Work>
    [[nodiscard]] bool inTransaction(Work work);
    [[nodiscard]] bool chooseWay();
    [[nodiscard]] bool prepare(Statement& statement, const char* ids) const;
    [[nodiscard]] bool readChosen(size_t most, std::vector<OwnedRecord>& part);
    [[nodiscard]] bool readAll(size_t most, std::vector<OwnedRecord>& part);

    Database& index_;
    const Condition& condition_;
    const int* cancel_;
    std::vector<int64_t> chosen_;  // ids to look at first
    size_t next_ = 0;              // of them
    int64_t after_ = 0;            // the records with higher ids follow
    bool atEnd_ = false;
    Statement one_, some_, last_;
};

// Whether the flag says so; null says no.
[[nodiscard]] bool isCancelled(const int* cancel);

}  // namespace vexo::fileindex

#endif
