#include "index/index_search.h"

#include <algorithm>
#include <string>

#include "failure.h"

namespace vexo::fileindex {
namespace {

// Records to look at one by one, each of which costs as much as several in passing. So few are looked at before names
// are asked; where trigrams do not help, a sixteenth of all.
constexpr int64_t kFewRecords = 4096;
constexpr int64_t kWorthPart = 16;
constexpr size_t kSoonRead = 2048;  // all of them, and no order is needed
// Somebody waits for the first rows; what is not found by then is found in the order of ids.
constexpr std::chrono::milliseconds kOrderTime(25);
// What is looked at in one transaction takes some 20 milliseconds at most: writers wait for it.
constexpr size_t kLooks = 4096;
constexpr int64_t kWindow = 65536;

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

int progress(void* cancel) {
    return static_cast<int>(isCancelled(static_cast<const int*>(cancel)));
}

bool highestId(Statement& statement, sqlite3* db, int64_t& id) {
    if (!statement && !statement.prepare(db, "SELECT max(id) FROM record")) return false;
    const bool read = statement.step() == Statement::kRow;
    if (read) id = statement.number(0);
    const KeepErrno keep;
    statement.reset();
    return read;
}

}  // namespace

bool isCancelled(const int* cancel) {
    return cancel != nullptr && __atomic_load_n(cancel, __ATOMIC_RELAXED) != 0;
}

IndexSearch::IndexSearch(Database& index, const Condition& condition, const int* cancel)
    : index_(index), condition_(condition), cancel_(cancel) {
    constexpr int steps = 100000;  // of SQLite's machine, a few milliseconds
    if (cancel != nullptr) sqlite3_progress_handler(index.handle(), steps, progress, const_cast<int*>(cancel));
}

IndexSearch::~IndexSearch() {
    sqlite3_progress_handler(index_.handle(), 0, nullptr, nullptr);
}

// One transaction: locks taken for every record would cost more than the records.
template <class Work>
bool IndexSearch::inTransaction(Work work) {
    const bool done = execute(index_.handle(), "BEGIN") && work();
    const KeepErrno keep;
    index_.rollBack();
    if (!isCancelled(cancel_)) return done;
    atEnd_ = true;
    return true;
}

bool IndexSearch::begin(std::unique_ptr<const Names> names, bool descending) {
    if (!inTransaction([&] { return chooseWay(); })) return false;
    const bool isLong = chosen_.size() > kSoonRead || (chosen_.empty() && after_ == 0);
    isShort_ = !isLong;
    if (names != nullptr && isLong && !atEnd_) {
        order_.emplace(index_, condition_, std::move(names), descending, Database::Clock::now() + kOrderTime);
    }
    return true;
}

bool IndexSearch::chooseWay() {
    State state{};
    if (!index_.readState(state) || !highestId(last_, index_.handle(), highest_)) return false;
    const int64_t worth = std::max(state.records / kWorthPart, kFewRecords);
    bool tooMany = true;
    if (condition_.folders) {
        tooMany = false;
        const int64_t most = condition_.trigrams ? kFewRecords : worth;
        if (!inFolders(index_.handle(), *condition_.folders, most, chosen_, tooMany)) return false;
    }
    if (tooMany && condition_.trigrams) {
        tooMany = false;
        chosen_.clear();
        if (!byTrigrams(index_.handle(), *condition_.trigrams, worth, chosen_, tooMany)) return false;
    }
    if (tooMany) {
        chosen_.clear();
    } else {
        after_ = highest_;
    }
    return true;
}

bool prepareRecords(Database& index, const Condition& condition, const char* ids, Statement& statement) {
    if (statement) return true;
    return statement.prepare(index.handle(), std::string("SELECT ") + kRecordColumns + ",id FROM record NOT INDEXED " +
                                                 "WHERE " + condition.sql + " AND " + ids) &&
           statement.bind(condition.values);
}

bool IndexSearch::read(size_t most, std::vector<OwnedRecord>& part) {
    return inTransaction([&] {
        if (order_) return readOrder(most, part);
        return next_ < chosen_.size() ? readChosen(most, part) : readAll(most, part);
    });
}

bool IndexSearch::readOrder(size_t most, std::vector<OwnedRecord>& part) {
    if (!order_->read(most, part)) return false;
    if (order_->wasWhole()) {
        next_ = chosen_.size();
        after_ = highest_;
    }
    if (order_->atEnd()) order_.reset();
    return true;
}

bool IndexSearch::readChosen(size_t most, std::vector<OwnedRecord>& part) {
    if (!prepareRecords(index_, condition_, "id=?", one_)) return false;
    const int idAt = static_cast<int>(condition_.values.size()) + 1;
    const size_t end = std::min(chosen_.size(), next_ + kLooks);
    const size_t full = part.size() + most;
    Statement::Step step = Statement::kDone;
    while (step != Statement::kFailed && next_ < end && part.size() < full) {
        if (!one_.bind(idAt, chosen_[next_++])) return false;
        step = one_.step();
        if (step == Statement::kRow) part.emplace_back(one_, 0);
        const KeepErrno keep;
        one_.reset();
    }
    return step != Statement::kFailed;
}

bool IndexSearch::readAll(size_t most, std::vector<OwnedRecord>& part) {
    int64_t highest = 0;
    if (!prepareRecords(index_, condition_, "id>? AND id<=? ORDER BY id LIMIT ?", some_) ||
        !highestId(last_, index_.handle(), highest)) {
        return false;
    }
    const int64_t windowEnd = highest - after_ > kWindow ? after_ + kWindow : highest;
    const int idAt = static_cast<int>(condition_.values.size()) + 1;
    if (!some_.bind(idAt, after_) || !some_.bind(idAt + 1, windowEnd) ||
        !some_.bind(idAt + 2, static_cast<int64_t>(most))) {
        return false;
    }
    const size_t before = part.size();
    Statement::Step step = some_.step();
    for (; step == Statement::kRow; step = some_.step()) {
        part.emplace_back(some_, 0);
        after_ = some_.number(kRecordWidth);
    }
    const KeepErrno keep;
    some_.reset();
    if (step == Statement::kFailed) return false;
    if (part.size() - before < most) {
        after_ = windowEnd;
        atEnd_ = windowEnd == highest;
    }
    return true;
}

}  // namespace vexo::fileindex
