// One result database at work: each operation reports and logs its failure.
#ifndef ORVEL_SEARCH_RESULT_DATABASE_H
#define ORVEL_SEARCH_RESULT_DATABASE_H

#include <cstdint>
#include <string>
#include <vector>

#include "search/record_address.h"
#include "vexo/index.h"

namespace orvel {

// Columns and the values that an update sets them to.
class ColumnValues {
 public:
    void add(__tag_FI_SQL_COND_TYPE column, const std::string& value);
    void add(__tag_FI_SQL_COND_TYPE column, int64_t value) { add(column, std::to_string(value)); }
    // Owner and group ids, permissions and times.
    void addStatus(const __tag_FI_FILE_INFO_DATA& record);
    // Share, path and what follows from them.
    void addAddress(const __tag_FI_FILE_INFO_DATA& record);
    // Every further column.
    void addRest(const __tag_FI_FILE_INFO_DATA& record);
    [[nodiscard]] const __tag_FI_SQL_COND* linked();  // valid until the next addition

 private:
    std::vector<__tag_FI_SQL_COND> nodes_;
};

class ResultDatabase {
 public:
    using Callback = BOOL (*)(__tag_FI_FILE_INFO_DATA*, void*);

    explicit ResultDatabase(const std::string& path) : path_(path) {}  // borrows `path`
    [[nodiscard]] bool remove(const RecordCondition& where) const;
    [[nodiscard]] bool update(ColumnValues& columns, const RecordCondition& where) const;
    [[nodiscard]] bool insert(const __tag_FI_FILE_INFO_DATA& record) const;
    [[nodiscard]] bool select(const RecordCondition& where, Callback callback, void* data) const;
    // Whether there is a record at `address`; false when that cannot be determined.
    [[nodiscard]] bool find(const RecordAddress& address, bool& found) const;

 private:
    const std::string& path_;
};

}  // namespace orvel

#endif
