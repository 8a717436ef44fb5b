#include "index/index_reading.h"

#include <algorithm>
#include <string>

#include "failure.h"

namespace vexo::fileindex {
namespace {

constexpr size_t kPart = 256;

}  // namespace

bool PartReader::read(Database& database, std::vector<OwnedRecord>& part) {
    // One transaction: locks taken for every record would cost more than the records.
    if (!execute(database.handle(), "BEGIN")) return false;
    const bool done = readRecords(database, part);
    const KeepErrno keep;
    database.rollBack();
    return done;
}

bool PartReader::readRecords(Database& database, std::vector<OwnedRecord>& part) {
    Statement statement;
    if (!statement.prepare(database.handle(), std::string("SELECT ") + kRecordColumns + " FROM record WHERE id=?")) {
        return false;
    }
    const size_t end = std::min(ids_.size(), next_ + kPart);
    part.reserve(end - next_);
    for (; next_ < end; ++next_) {
        if (!statement.bind(1, ids_[next_])) return false;
        const Statement::Step step = statement.step();
        if (step == Statement::kFailed) return false;
        if (step == Statement::kRow) part.emplace_back(statement, 0);
        statement.reset();
    }
    return true;
}

}  // namespace vexo::fileindex
