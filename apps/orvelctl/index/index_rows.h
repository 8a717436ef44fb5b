// The rows of a share's index, written by one indexer.
#ifndef ORVEL_ORVELCTL_INDEX_INDEX_ROWS_H
#define ORVEL_ORVELCTL_INDEX_INDEX_ROWS_H

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>

#include "index/folder_state.h"
#include "index/share_files.h"
#include "orvel/file_record.h"

namespace orvel::ctl {

// A row without its address. The time of the last access is left out: reading a file is no change.
struct Row {
    bool isFolder = false;
    int64_t size = 0;
    FolderTimes times;
    uint32_t mode = 0, uid = 0, gid = 0;
    std::string owner, group;

    bool operator==(const Row& other) const;
};

// Each operation throws std::runtime_error when the index cannot be read or written.
class IndexRows {
 public:
    // `root` and `share`: of every row; `database`: what FILEIDXIndexBegin gave.
    IndexRows(std::string root, std::string share, std::string database)
        : root_(std::move(root)), share_(std::move(share)), database_(std::move(database)) {}

    // The rows directly in a folder by name; "" is the share's root.
    std::map<std::string, Row> in(const std::string& folder);
    // The row at a path, if there is one.
    std::optional<Row> at(const std::string& path);
    // Every folder by its path.
    std::map<std::string, Row> folders();

    // The row that the entry ought to have.
    Row rowOf(const Entry& entry);
    // A row that is there already stays as it is.
    void insert(const Entry& entry);
    void remove(const std::string& path);
    // Removes what lies below the folder and reports how much it was.
    unsigned long long removeBelow(const std::string& folder);
    // What was written so far is there for searches.
    void commit();

 private:
    const __tag_FI_FILE_INFO_DATA& fill(const Entry& entry);
    void select(const __tag_FI_SQL_COND& where, const std::function<void(const __tag_FI_FILE_INFO_DATA&)>& take);

    std::string root_, share_, database_;
    FileSearch::FileRecord record_;
    std::string realPath_;  // borrowed by the record
};

}  // namespace orvel::ctl

#endif
