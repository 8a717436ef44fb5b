// The columns of a record by their numbers.
#ifndef VEXO_LINUX_INDEX_COLUMNS_H
#define VEXO_LINUX_INDEX_COLUMNS_H

#include <string>
#include <string_view>

#include "index/index_statement.h"
#include "vexo/index.h"

namespace vexo::fileindex {

struct Column {
    const char* name;
    bool isText;
};

// Null for a number that is no column's.
[[nodiscard]] const Column* columnOf(int number);

// "name,share,..." in the order of OwnedRecord.
extern const char* const kRecordColumns;
constexpr int kRecordWidth = 18;  // how many they are

// Whether the index of a share stores the column: its path, share and root follow from others.
[[nodiscard]] bool isStoredInShare(int column);

// Adds a record unless one is there; the last value is its id. bindRecord gives the others, borrows the record's texts
// until the statement is reset, and says in `at` how many they were.
[[nodiscard]] std::string insertionSql(bool ofShare);
[[nodiscard]] bool bindRecord(Statement& statement, const __tag_FI_FILE_INFO_DATA& record, bool ofShare, int& at);

// A record with its texts.
class OwnedRecord {
 public:
    // From the columns `first`... of the current row.
    OwnedRecord(const Statement& statement, int first);
    // Valid while this object lives and stays where it is.
    [[nodiscard]] __tag_FI_FILE_INFO_DATA view() const;

 private:
    enum { kTexts = 9 };
    std::string texts_;  // each ends in NUL
    size_t starts_[kTexts];
    __tag_FI_FILE_INFO_DATA numbers_;
};

}  // namespace vexo::fileindex

#endif
