// Writing records, in batches.
#include <cerrno>
#include <ctime>
#include <string>

#include "failure.h"
#include "index/index_columns.h"
#include "index/index_database.h"
#include "index/index_names_format.h"

namespace vexo::fileindex {
namespace {

using Node = __tag_FI_SQL_COND;

// In a search that finds much, a batch is this large; in one that finds little, it is this old.
constexpr int kBatchRows = 50000;
constexpr int kLookRows = 4096;  // between two looks at the room that is left
constexpr std::chrono::milliseconds kBatchAge(300);
constexpr std::chrono::milliseconds kFirstAge(30);  // somebody waits for the first rows
constexpr int kSetLimit = FI_COL_GROUP + 1;

std::vector<const Node*> nodesToSet(const Node* set) {
    std::vector<const Node*> nodes;
    for (const Node* node = set; node != nullptr; node = node->pAndNext) {
        const Column* column = columnOf(node->type);
        if (column == nullptr || node->op != FI_OP_EQUAL || nodes.size() == kSetLimit) return {};
        nodes.push_back(node);
    }
    return nodes;
}

void append(std::vector<Value>& to, const std::vector<Value>& values) {
    to.insert(to.end(), values.begin(), values.end());
}

}  // namespace

bool Database::begin() {
    if (began_) return true;
    // Others of the user's results may have grown since the last batch.
    if (!ofShare_ && !boundRoom()) return false;
    // Orders that were made for the records as they were are gone with the first change.
    if (!execute(db_, "BEGIN IMMEDIATE;DELETE FROM ranking")) {
        const KeepErrno keep;
        rollBack();
        return false;
    }
    if (ofShare_ && !readHighest(highest_)) {
        const KeepErrno keep;
        rollBack();
        return false;
    }
    began_ = Clock::now();
    rows_ = 0;
    added_ = 0;
    return true;
}

bool Database::written(bool done) {
    if (done && !ofShare_ && rows_ % kLookRows == kLookRows - 1) done = boundRoom();
    if (!done) {
        const KeepErrno keep;
        rollBack();
        return false;
    }
    ++rows_;
    const bool large = rows_ >= kBatchRows;
    // The clock is asked seldom: it costs as much as a part of an insert.
    const bool old = rows_ % 16 == 0 && Clock::now() - *began_ >= (isFirst_ ? kFirstAge : kBatchAge);
    return large || old ? commit() : true;
}

bool Database::commit() {
    if (!began_) return true;
    const std::string counted = "UPDATE state SET records=records+(" + std::to_string(added_) +
                                "),written=" + std::to_string(time(nullptr)) +
                                (ofShare_ ? ",highest=" + std::to_string(highest_) : "") + ";COMMIT";
    const bool done = execute(db_, counted.c_str());
    if (!done) {
        const KeepErrno keep;
        rollBack();
    }
    began_.reset();
    isFirst_ = false;
    return done;
}

void Database::rollBack() {
    insert_.reset();
    if (sqlite3_get_autocommit(db_) == 0) sqlite3_exec(db_, "ROLLBACK", nullptr, nullptr, nullptr);
    began_.reset();
}

bool Database::insert(const __tag_FI_FILE_INFO_DATA& record) {
    if (!begin()) return false;
    if (!insert_ && !insert_.prepare(db_, insertionSql(isIndex_))) return written(false);
    int at = 0;
    if (!bindRecord(insert_, record, isIndex_, at)) return written(false);
    if (ofShare_ && !insert_.bind(at + 1, highest_ + 1)) return written(false);
    const bool done = insert_.run();
    const int count = done ? sqlite3_changes(db_) : 0;
    added_ += count;
    highest_ += count;
    return written(done);
}

bool Database::change(const std::string& sql, const std::vector<Value>& values) {
    Statement statement;
    return statement.prepare(db_, sql) && statement.bind(values) && statement.run();
}

// Records at the address that moved ones come to are replaced by them.
bool Database::clearTarget(const std::vector<const Node*>& set, const Condition& where) {
    std::string share = "share";
    std::string path = "path";
    std::vector<Value> values;
    for (const Node* node : set) {
        if (node->type != FI_COL_SHARE && node->type != FI_COL_PATH) continue;
        std::string& parameter = node->type == FI_COL_SHARE ? share : path;
        parameter = '?';
        parameter += std::to_string(values.size() + 1);
        values.push_back(valueOf(*node));
    }
    if (values.empty()) return true;
    append(values, where.values);
    append(values, where.values);
    if (!change("DELETE FROM record WHERE (path,share) IN (SELECT " + path + "," + share + " FROM record WHERE " +
                    where.sql + ") AND NOT (" + where.sql + ")",
                values)) {
        return false;
    }
    added_ -= sqlite3_changes64(db_);
    return true;
}

bool Database::update(const Node* set, const Node* where) {
    const std::vector<const Node*> nodes = nodesToSet(set);
    if (nodes.empty()) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return false;
    }
    const std::optional<Condition> condition = readCondition(where, {});
    if (!condition || !begin()) return false;
    std::string sql = "UPDATE record SET ";
    std::vector<Value> values;
    for (const Node* node : nodes) {
        if (isIndex_ && !isStoredInShare(node->type)) continue;
        if (!values.empty()) sql += ',';
        sql += columnOf(node->type)->name;
        sql += "=?";
        values.push_back(valueOf(*node));
    }
    if (values.empty()) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return written(false);
    }
    append(values, condition->values);
    // Names that were packed may have changed.
    if (ofShare_ && !execute(db_, drawMark().c_str())) return written(false);
    return written(clearTarget(nodes, *condition) && change(sql + " WHERE " + condition->sql, values));
}

bool Database::remove(const Node* where) {
    const std::optional<Condition> condition = readCondition(where, {});
    // A batch may end before a record is removed, but not behind: what is written in its place must not be missing.
    if (!condition || (began_ && rows_ >= kBatchRows && !commit()) || !begin()) return false;
    const bool done = change("DELETE FROM record WHERE " + condition->sql, condition->values);
    if (!done) return written(false);
    added_ -= sqlite3_changes64(db_);
    ++rows_;
    return true;
}

}  // namespace vexo::fileindex
