#include "index/index_rows.h"

#include <climits>
#include <stdexcept>
#include <tuple>

#include "command.h"
#include "orvel/search_criteria.h"
#include "vexo/error.h"
#include "vexo/index.h"

namespace orvel::ctl {
namespace {

Row rowFrom(const __tag_FI_FILE_INFO_DATA& record) {
    return {.isFolder = record.isDir != 0,
            .size = record.size,
            .times = {record.modified, record.changed, record.created},
            .mode = record.mode,
            .uid = record.uid,
            .gid = record.gid,
            .owner = record.szOwner,
            .group = record.szGroup};
}

__tag_FI_SQL_COND condition(__tag_FI_SQL_COND_TYPE column, __tag_FI_SQL_COND_OP op, const std::string& value) {
    __tag_FI_SQL_COND made;
    FileSearch::setSqlCond(made, column, op, value, nullptr, nullptr);
    return made;
}

void require(int result, const char* what) {
    if (result >= 0) return;
    char text[64];
    snprintf(text, sizeof text, "the index cannot be %s: platform error 0x%04X", what,
             static_cast<unsigned>(VLIBCErrGet()));
    throw std::runtime_error(text);
}

using Take = std::function<void(const __tag_FI_FILE_INFO_DATA&)>;

// What `take` throws must not pass through the platform.
struct Taking {
    const Take& take;
    bool failed = false;
};

BOOL hand(__tag_FI_FILE_INFO_DATA* record, void* arg) {
    auto& taking = *static_cast<Taking*>(arg);
    try {
        taking.take(*record);
    } catch (const std::exception&) {
        taking.failed = true;
    }
    return taking.failed ? 0 : 1;
}

}  // namespace

bool Row::operator==(const Row& other) const {
    const auto all = [](const Row& row) {
        return std::tie(row.isFolder, row.size, row.times.modified, row.times.changed, row.times.created, row.mode,
                        row.uid, row.gid, row.owner, row.group);
    };
    return all(*this) == all(other);
}

void IndexRows::select(const __tag_FI_SQL_COND& where, const Take& take) {
    FIQUERY query = {};
    query.cond = &where;
    query.limit = LONG_MAX;
    Taking taking = {take};
    require(FILEIDXDBSelect(database_.c_str(), &query, hand, &taking), "read");
    if (taking.failed) throw std::bad_alloc();
}

std::map<std::string, Row> IndexRows::in(const std::string& folder) {
    std::map<std::string, Row> rows;
    // The slash: behind a folder named "*" its end would mean "at any depth".
    select(condition(FI_COL_PATH, FI_OP_PATH, folder + "/"),
           [&](const __tag_FI_FILE_INFO_DATA& record) { rows.emplace(record.szName, rowFrom(record)); });
    return rows;
}

std::optional<Row> IndexRows::at(const std::string& path) {
    std::optional<Row> row;
    select(condition(FI_COL_PATH, FI_OP_EQUAL, path),
           [&](const __tag_FI_FILE_INFO_DATA& record) { row = rowFrom(record); });
    return row;
}

std::map<std::string, Row> IndexRows::folders() {
    std::map<std::string, Row> folders;
    select(condition(FI_COL_IS_DIR, FI_OP_EQUAL, "1"),
           [&](const __tag_FI_FILE_INFO_DATA& record) { folders.emplace(record.szPath, rowFrom(record)); });
    return folders;
}

const __tag_FI_FILE_INFO_DATA& IndexRows::fill(const Entry& entry) {
    realPath_ = root_ + "/" + entry.path;
    if (record_.fill(realPath_, root_, share_, entry.name, entry.status) != FileSearch::PathFault::kNone) {
        throw std::runtime_error(terminalText(realPath_) + " lies in no share");
    }
    return record_.data();
}

Row IndexRows::rowOf(const Entry& entry) {
    return rowFrom(fill(entry));
}

void IndexRows::insert(const Entry& entry) {
    require(FILEIDXDBInsert(database_.c_str(), &fill(entry), 1), "written");
}

void IndexRows::remove(const std::string& path) {
    const __tag_FI_SQL_COND where = condition(FI_COL_PATH, FI_OP_EQUAL, path);
    require(FILEIDXDBDel(database_.c_str(), &where), "written");
}

void IndexRows::commit() {
    require(FILEIDXDBFlush(database_.c_str()), "written");
}

unsigned long long IndexRows::removeBelow(const std::string& folder) {
    const __tag_FI_SQL_COND where = condition(FI_COL_PATH, FI_OP_PATH, folder + "/*");
    FIQUERY query = {};
    query.cond = &where;
    unsigned long long count = 0;
    require(FILEIDXCountGet(database_.c_str(), &query, &count), "read");
    if (count > 0) require(FILEIDXDBDel(database_.c_str(), &where), "written");
    return count;
}

}  // namespace orvel::ctl
