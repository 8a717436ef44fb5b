#include "index/index_search.h"

#include <algorithm>
#include <string>

#include "failure.h"

namespace vexo::fileindex {
namespace {

// Records to look at one by one, each of which costs as much as several in passing. So few are looked at before names
// are asked; where trigrams do not help, an eighth of all.
constexpr int64_t kFewRecords = 4096;
constexpr int64_t kWorthPart = 8;

// Appends what the statement gives, `most` at most; `enough` when there is more.
bool collect(Statement& statement, int64_t most, std::vector<int64_t>& ids, bool& enough) {
    Statement::Step step = Statement::kDone;
    while (!enough && (step = statement.step()) == Statement::kRow) {
        enough = static_cast<int64_t>(ids.size()) >= most;
        ids.push_back(statement.number(0));
    }
    return step != Statement::kFailed;
}

// The records of the folders; `enough` when there are more than `most`.
bool inFolders(sqlite3* db, const std::vector<Folder>& folders, int64_t most, std::vector<int64_t>& ids, bool& enough) {
    Statement below;
    Statement direct;
    if (!below.prepare(db, "SELECT id FROM record WHERE path>? AND path<?") ||
        !direct.prepare(db, "SELECT id FROM record WHERE parent=?")) {
        return false;
    }
    for (const Folder& folder : folders) {
        Statement& statement = folder.below ? below : direct;
        const std::vector<Value> values =
            folder.below ? std::vector<Value>{folder.path + "/", folder.path + "0"} : std::vector<Value>{folder.path};
        if (!statement.bind(values) || !collect(statement, most, ids, enough)) return false;
        statement.reset();
        if (enough) return true;
    }
    std::sort(ids.begin(), ids.end());
    ids.erase(std::unique(ids.begin(), ids.end()), ids.end());
    return true;
}

bool byTrigrams(sqlite3* db, const std::string& trigrams, int64_t most, std::vector<int64_t>& ids, bool& enough) {
    Statement statement;
    if (!statement.prepare(db, "SELECT rowid FROM trigram WHERE trigram MATCH ?") || !statement.bindText(1, trigrams)) {
        return false;
    }
    return collect(statement, most, ids, enough);
}

// Leaves the ids of records that satisfy the condition.
bool filter(sqlite3* db, const Condition& condition, const int* cancel, std::vector<int64_t>& ids) {
    Statement statement;
    if (!statement.prepare(db, "SELECT 1 FROM record WHERE " + condition.sql + " AND id=?") ||
        !statement.bind(condition.values)) {
        return false;
    }
    const int idAt = static_cast<int>(condition.values.size()) + 1;
    size_t kept = 0;
    for (const int64_t id : ids) {
        if (isCancelled(cancel)) break;
        if (!statement.bind(idAt, id)) return false;
        const Statement::Step step = statement.step();
        if (step == Statement::kFailed) return false;
        if (step == Statement::kRow) ids[kept++] = id;
        statement.reset();
    }
    ids.resize(kept);
    return true;
}

bool search(Database& index, const Condition& condition, const int* cancel, std::vector<int64_t>& ids) {
    State state{};
    if (!index.readState(state)) return false;
    const int64_t worth = std::max(state.records / kWorthPart, kFewRecords);
    if (condition.folders) {
        bool enough = false;
        if (!inFolders(index.handle(), *condition.folders, condition.trigrams ? kFewRecords : worth, ids, enough)) {
            return false;
        }
        if (!enough) return filter(index.handle(), condition, cancel, ids);
        ids.clear();
    }
    if (condition.trigrams) {
        bool enough = false;
        if (!byTrigrams(index.handle(), *condition.trigrams, worth, ids, enough)) return false;
        if (!enough) return filter(index.handle(), condition, cancel, ids);
        ids.clear();
    }
    return index.select(condition, ids);
}

int progress(void* cancel) {
    return static_cast<int>(isCancelled(static_cast<const int*>(cancel)));
}

}  // namespace

bool isCancelled(const int* cancel) {
    return cancel != nullptr && __atomic_load_n(cancel, __ATOMIC_RELAXED) != 0;
}

bool searchIndex(Database& index, const Condition& condition, const int* cancel, std::vector<int64_t>& ids,
                 int64_t& version) {
    constexpr int steps = 100000;  // of SQLite's machine, a few milliseconds
    if (!execute(index.handle(), "BEGIN")) return false;
    sqlite3_progress_handler(index.handle(), steps, cancel == nullptr ? nullptr : progress, const_cast<int*>(cancel));
    const bool found = search(index, condition, cancel, ids) && index.readVersion(version);
    const KeepErrno keep;
    sqlite3_progress_handler(index.handle(), 0, nullptr, nullptr);
    index.rollBack();
    if (!isCancelled(cancel)) return found;
    ids.clear();
    return true;
}

}  // namespace vexo::fileindex
