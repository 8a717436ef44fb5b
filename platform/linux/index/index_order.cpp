#include "index/index_order.h"

#include <algorithm>
#include <cstring>
#include <ctime>
#include <limits>
#include <map>
#include <optional>

#include "failure.h"
#include "index/index_columns.h"
#include "index/index_sort.h"

namespace vexo::fileindex {
namespace {

constexpr size_t kPartRecords = 4096;     // of an order, in one row
constexpr int64_t kWorthKeeping = 10000;  // records; fewer are sorted at each request
constexpr int64_t kQuietSeconds = 1;      // without a change, and the search has most likely ended
constexpr size_t kAll = std::numeric_limits<size_t>::max();

// The first row of the order in the table of rankings: one number for each combination of columns and directions.
int64_t firstRow(const FIQUERY& query) {
    int64_t number = 0;
    for (int i = 0; i < query.nSort; ++i) {
        const int direction = query.sort[i].descending != 0 ? 1 : 0;
        number = number * 64 + 1 + query.sort[i].column * 2 + direction;
    }
    return number << 32;
}

// Whether an order is worth keeping: there are many records, and their search has most likely ended. A clock that was
// set back counts as time gone by.
bool isWorthKeeping(const State& state) {
    const int64_t now = time(nullptr);
    const bool isQuiet = state.written > now || now - state.written > kQuietSeconds;
    return state.records >= kWorthKeeping && isQuiet;
}

bool addKeys(Database& database, const FIQUERY& query, const Condition& condition, Sorter& sorter) {
    std::string sql = "SELECT id";
    for (int i = 0; i < query.nSort; ++i) sql += std::string(",") + columnOf(query.sort[i].column)->name;
    Statement statement;
    if (!statement.prepare(database.handle(), sql + " FROM record WHERE " + condition.sql + " ORDER BY id") ||
        !statement.bind(condition.values)) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) {
        sorter.add(statement.number(0), [&](std::string& key) {
            for (int i = 0; i < query.nSort; ++i) {
                const bool descending = query.sort[i].descending != 0;
                if (columnOf(query.sort[i].column)->isText) {
                    appendKey(std::string_view(statement.text(i + 1).data()), descending, key);
                } else {
                    appendKey(statement.number(i + 1), descending, key);
                }
            }
        });
    }
    return step == Statement::kDone;
}

// The index gives the records of each share in the order of their paths.
bool addRanks(Database& database, Sorter& sorter) {
    Statement statement;
    if (!statement.prepare(database.handle(), "SELECT id,share FROM record ORDER BY path,share")) return false;
    std::map<std::string, std::vector<int64_t>, std::less<>> shares;
    auto share = shares.end();
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) {
        const std::string_view name = statement.text(1);
        if (share == shares.end() || share->first != name) share = shares.try_emplace(std::string(name)).first;
        share->second.push_back(statement.number(0));
    }
    for (const auto& [name, ids] : shares) {
        for (const int64_t id : ids) sorter.rank(id);
    }
    return step == Statement::kDone;
}

bool sortNow(Database& database, const FIQUERY& query, const Condition& condition, size_t first, size_t count,
             std::vector<int64_t>& ids) {
    Sorter sorter;
    if (!addKeys(database, query, condition, sorter) || !addRanks(database, sorter)) return false;
    ids = sorter.sorted(first, count);
    return true;
}

std::string packed(const std::vector<int64_t>& ids, size_t from) {
    std::string part;
    for (size_t i = from; i < std::min(ids.size(), from + kPartRecords); ++i) {
        for (int bits = 0; bits < 32; bits += 8) part += static_cast<char>(static_cast<uint64_t>(ids[i]) >> bits);
    }
    return part;
}

bool writeOrder(Database& database, int64_t row, const std::vector<int64_t>& ids) {
    Statement statement;
    if (!statement.prepare(database.handle(), "INSERT OR REPLACE INTO ranking VALUES(?,?)")) return false;
    for (size_t from = 0; from < ids.size(); from += kPartRecords) {
        const std::string part = packed(ids, from);
        if (!statement.bind(1, row++) || !statement.bindBytes(2, part) || !statement.run()) return false;
    }
    return true;
}

// Sorts everything and keeps the order. That it could not be kept, where the disk is full or somebody writes, is no
// failure.
bool makeOrder(Database& database, const FIQUERY& query, std::vector<int64_t>& order) {
    if (!execute(database.handle(), "BEGIN")) return false;
    const bool sorted = sortNow(database, query, {"1"}, 0, kAll, order);
    const KeepErrno keep;
    const QuietFailures quiet;
    const bool fits = sorted && std::all_of(order.begin(), order.end(), [](int64_t id) {
                          return id >= 0 && id <= std::numeric_limits<uint32_t>::max();
                      });
    database.waitForOthers(false);
    if (!fits || !writeOrder(database, firstRow(query), order) || !execute(database.handle(), "COMMIT")) {
        database.rollBack();
    }
    database.waitForOthers(true);
    return sorted;
}

// Whether an order is kept.
bool findOrder(Database& database, const FIQUERY& query, bool& found) {
    Statement statement;
    if (!statement.prepare(database.handle(), "SELECT 1 FROM ranking WHERE id=?") ||
        !statement.bind(1, firstRow(query))) {
        return false;
    }
    const Statement::Step step = statement.step();
    found = step == Statement::kRow;
    return step != Statement::kFailed;
}

// Calls `take` with each id of a kept order from position `first` on, until it answers false.
template <class Take>
bool readOrder(Database& database, const FIQUERY& query, size_t first, Take take) {
    Statement statement;
    const int64_t start = firstRow(query);
    const auto skipped = static_cast<int64_t>(std::min<size_t>(first / kPartRecords, UINT32_MAX));
    if (!statement.prepare(database.handle(), "SELECT records FROM ranking WHERE id BETWEEN ? AND ? ORDER BY id") ||
        !statement.bind(1, start + skipped) || !statement.bind(2, start + UINT32_MAX)) {
        return false;
    }
    size_t at = first % kPartRecords * 4;
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step(), at = 0) {
        const std::string_view part = statement.text(0);
        for (; at + 4 <= part.size(); at += 4) {
            int64_t id = 0;
            for (size_t i = 4; i-- > 0;) id = (id << 8) | static_cast<unsigned char>(part[at + i]);
            if (!take(id)) return true;
        }
    }
    return step == Statement::kDone;
}

bool isAmong(const std::vector<int64_t>& ascending, int64_t id) {
    if (ascending.empty() || id < ascending.front()) return false;
    const auto expected = static_cast<uint64_t>(id) - static_cast<uint64_t>(ascending.front());
    if (expected < ascending.size() && ascending[expected] == id) return true;
    return std::binary_search(ascending.begin(), ascending.end(), id);
}

// The page out of an order, of the records that satisfy the query's condition. `read(first, take)` calls `take` with
// the ids from position `first` on until it answers false.
template <class Read>
bool pageOfOrder(Database& database, const FIQUERY& query, const Condition& condition, Read read,
                 std::vector<int64_t>& ids) {
    size_t left = query.limit;
    const auto take = [&](int64_t id) {
        ids.push_back(id);
        return --left > 0;
    };
    if (query.cond == nullptr) return read(query.offset, take);
    std::vector<int64_t> satisfying;
    if (!database.select(condition, satisfying)) return false;
    size_t skip = query.offset;
    return read(0, [&](int64_t id) {
        if (!isAmong(satisfying, id)) return true;
        if (skip == 0) return take(id);
        --skip;
        return true;
    });
}

bool pageOfKept(Database& database, const FIQUERY& query, const Condition& condition, std::vector<int64_t>& ids) {
    const auto read = [&](size_t first, auto take) { return readOrder(database, query, first, take); };
    return pageOfOrder(database, query, condition, read, ids);
}

bool pageOfNew(Database& database, const FIQUERY& query, const Condition& condition, std::vector<int64_t>& ids) {
    std::vector<int64_t> order;
    if (!makeOrder(database, query, order)) return false;
    const auto read = [&](size_t first, auto take) {
        for (size_t i = first; i < order.size() && take(order[i]); ++i) {
        }
        return true;
    };
    return pageOfOrder(database, query, condition, read, ids);
}

bool unsortedPage(Database& database, const FIQUERY& query, const Condition& condition, std::vector<int64_t>& ids) {
    if (!database.select(condition, ids)) return false;
    const size_t from = std::min<size_t>(query.offset, ids.size());
    const size_t to = from + std::min<size_t>(query.limit, ids.size() - from);
    ids = std::vector<int64_t>(ids.begin() + static_cast<std::ptrdiff_t>(from),
                               ids.begin() + static_cast<std::ptrdiff_t>(to));
    return true;
}

bool sortIsValid(const FIQUERY& query) {
    if (query.nSort < 0 || query.nSort > 2) return false;
    for (int i = 0; i < query.nSort; ++i) {
        if (columnOf(query.sort[i].column) == nullptr) return false;
    }
    return true;
}

}  // namespace

bool selectPage(Database& database, const FIQUERY& query, std::vector<int64_t>& ids) {
    if (!sortIsValid(query)) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return false;
    }
    const std::optional<Condition> condition = readCondition(query.cond, {});
    if (!condition) return false;
    if (query.limit == 0) return true;
    if (query.nSort == 0) return unsortedPage(database, query, *condition, ids);
    bool kept = false;
    if (!findOrder(database, query, kept)) return false;
    if (kept) return pageOfKept(database, query, *condition, ids);
    State state{};
    if (!database.readState(state)) return false;
    if (isWorthKeeping(state)) return pageOfNew(database, query, *condition, ids);
    return sortNow(database, query, *condition, query.offset, query.limit, ids);
}

}  // namespace vexo::fileindex
