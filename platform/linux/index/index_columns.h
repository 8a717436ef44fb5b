// The columns of a record by their numbers.
#ifndef VEXO_LINUX_INDEX_COLUMNS_H
#define VEXO_LINUX_INDEX_COLUMNS_H

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

// "share,path,..." in the order of bindRecord and readRecord, and as many "?".
extern const char* const kRecordColumns;
extern const char* const kRecordMarks;
constexpr int kRecordWidth = 18;  // how many they are

// Borrows the record's texts until the statement is reset.
[[nodiscard]] bool bindRecord(Statement& statement, const __tag_FI_FILE_INFO_DATA& record);

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
