#include "search/result_database.h"

#include <syslog.h>

#include <climits>

#include "base/printable.h"
#include "orvel/search_criteria.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelsearch";

}  // namespace

void ColumnValues::add(__tag_FI_SQL_COND_TYPE column, const std::string& value) {
    FileSearch::setSqlCond(nodes_.emplace_back(), column, FI_OP_EQUAL, value, nullptr, nullptr);
}

void ColumnValues::addStatus(const __tag_FI_FILE_INFO_DATA& record) {
    add(FI_COL_PERMISSION, record.szPermission);
    add(FI_COL_UID, record.uid);
    add(FI_COL_GID, record.gid);
    add(FI_COL_CREATE_TIME, record.created);
    add(FI_COL_ACCESS_TIME, record.accessed);
    add(FI_COL_MODIFY_TIME, record.modified);
    add(FI_COL_CHANGE_TIME, record.changed);
    add(FI_COL_MODE, record.mode);
}

void ColumnValues::addAddress(const __tag_FI_FILE_INFO_DATA& record) {
    add(FI_COL_SHARE_ROOT, record.szShareRoot);
    add(FI_COL_SHARE, record.szShare);
    add(FI_COL_PATH, record.szPath);
    add(FI_COL_NAME, record.szName);
    add(FI_COL_PARENT, record.szParent);
    add(FI_COL_EXTENSION, record.szExtension);
}

void ColumnValues::addRest(const __tag_FI_FILE_INFO_DATA& record) {
    add(FI_COL_IS_DIR, record.isDir);
    add(FI_COL_SIZE, record.size);
    add(FI_COL_OWNER, record.szOwner);
    add(FI_COL_GROUP, record.szGroup);
}

const __tag_FI_SQL_COND* ColumnValues::linked() {
    for (std::size_t i = 0; i + 1 < nodes_.size(); ++i) nodes_[i].pAndNext = &nodes_[i + 1];
    return nodes_.data();
}

bool ResultDatabase::remove(const RecordCondition& where) const {
    if (FILEIDXDBDel(path_.c_str(), where.get()) >= 0) return true;
    syslog(LOG_ERR, "%s:%d Fail to delete data in DB %s", kSource, __LINE__, printable(path_).c_str());
    return false;
}

bool ResultDatabase::update(ColumnValues& columns, const RecordCondition& where) const {
    if (FILEIDXDBUpdate(path_.c_str(), columns.linked(), where.get()) >= 0) return true;
    syslog(LOG_ERR, "%s:%d Fail to update data in DB %s", kSource, __LINE__, printable(path_).c_str());
    return false;
}

bool ResultDatabase::insert(const __tag_FI_FILE_INFO_DATA& record) const {
    if (FILEIDXDBInsert(path_.c_str(), &record, 1) >= 0) return true;
    syslog(LOG_ERR, "%s:%d Fail to insert data in DB %s", kSource, __LINE__, printable(path_).c_str());
    return false;
}

bool ResultDatabase::select(const RecordCondition& where, Callback callback, void* data) const {
    FIQUERY query{};
    query.cond = where.get();
    query.limit = LONG_MAX;
    if (FILEIDXDBSelect(path_.c_str(), &query, callback, data) >= 0) return true;
    syslog(LOG_ERR, "%s:%d Fail to select data from DB %s", kSource, __LINE__, printable(path_).c_str());
    return false;
}

bool ResultDatabase::find(const RecordAddress& address, bool& found) const {
    const auto note = [](__tag_FI_FILE_INFO_DATA*, void* flag) -> BOOL {
        *static_cast<bool*>(flag) = true;
        return 0;
    };
    found = false;
    return select(RecordCondition(address, RecordCondition::Reach::kItself), note, &found);
}

}  // namespace orvel
