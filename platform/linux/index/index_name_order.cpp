#include "index/index_name_order.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "failure.h"
#include "index/index_search.h"
#include "index/index_sort.h"

namespace vexo::fileindex {
namespace {

int comparePaths(const OwnedRecord& a, const OwnedRecord& b) {
    return std::string_view(a.view().szPath).compare(b.view().szPath);
}

// Which numbers of extensions the records may have; none where that is not known.
std::vector<bool> wantedExtensions(const Condition& condition, const Names& names) {
    if (!asksForExtension(condition)) return {};
    std::vector<bool> wanted(size_t{kNoExtension} + 1, false);
    wanted[kOtherExtension] = true;
    size_t number = kOtherExtension;
    names.eachExtension([&](std::string_view extension) {
        if (++number < kNoExtension) wanted[number] = mayHaveExtension(condition, extension);
    });
    return wanted;
}

}  // namespace

NameOrder::NameOrder(Database& index, const Condition& condition, std::unique_ptr<const Names> names, bool descending,
                     Database::Clock::time_point end)
    : index_(index),
      condition_(condition),
      names_(std::move(names)),
      descending_(descending),
      end_(end),
      at_(*names_, descending, wantedExtensions(condition, *names_)) {}

// The clock is asked seldom: it costs as much as a look.
bool NameOrder::isLate() {
    return ++looks_ % 64 == 0 && Database::Clock::now() >= end_;
}

NameOrder::Found NameOrder::foundIn(const Statement& statement) const {
    Found found{OwnedRecord(statement, 0), {}};
    appendKey(std::string_view(found.record.view().szName), descending_, found.key);
    return found;
}

bool NameOrder::readNew() {
    begun_ = true;
    Statement statement;
    if (!prepareRecords(index_, condition_, "id>?", statement) ||
        !statement.bind(static_cast<int>(condition_.values.size()) + 1, names_->highest())) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow && !isLate(); step = statement.step()) new_.push_back(foundIn(statement));
    // Without all of them no order is right.
    atEnd_ = step == Statement::kRow;
    std::sort(new_.begin(), new_.end(), [](const Found& a, const Found& b) {
        return a.key != b.key ? a.key > b.key : comparePaths(a.record, b.record) > 0;
    });
    return step != Statement::kFailed;
}

// The next packed name whose record satisfies; none at their end or when it is late.
bool NameOrder::findPacked(std::optional<Found>& found) {
    const int idAt = static_cast<int>(condition_.values.size()) + 1;
    for (unsigned passed = 1;; ++passed) {
        if (!at_.next()) {
            packedEnd_ = true;
            return true;
        }
        const bool fits = fitsNames(condition_, at_.name());
        if ((fits || passed % 64 == 0) && isLate()) {
            atEnd_ = true;
            return true;
        }
        if (!fits) continue;
        if (!one_.bind(idAt, at_.id())) return false;
        const Statement::Step step = one_.step();
        if (step == Statement::kRow) found = foundIn(one_);
        const KeepErrno keep;
        one_.reset();
        if (step == Statement::kFailed) return false;
        if (found) return true;
    }
}

bool NameOrder::read(size_t most, std::vector<OwnedRecord>& part) {
    if (!begun_ && !readNew()) return false;
    if (!one_ && !prepareRecords(index_, condition_, "id=?", one_)) return false;
    for (const size_t full = part.size() + most; part.size() < full && !atEnd_;) {
        if (!packed_ && !packedEnd_ && !findPacked(packed_)) return false;
        if (atEnd_) break;
        const bool takesNew =
            !new_.empty() &&
            (!packed_ || new_.back().key < packed_->key ||
             (new_.back().key == packed_->key && comparePaths(new_.back().record, packed_->record) < 0));
        if (takesNew) {
            part.push_back(std::move(new_.back().record));
            new_.pop_back();
        } else if (packed_) {
            part.push_back(std::move(packed_->record));
            packed_.reset();
        } else {
            atEnd_ = whole_ = true;
        }
    }
    return true;
}

}  // namespace vexo::fileindex
