// Which records of a result database an update is about.
#ifndef ORVEL_SEARCH_RECORD_ADDRESS_H
#define ORVEL_SEARCH_RECORD_ADDRESS_H

#include <string>

#include "vexo/index.h"

namespace orvel {

// Where a record stands: share and path within it, and the real path that gave them.
struct RecordAddress {
    std::string share;
    std::string realPath;
    std::string shareRoot;
    std::string within;
};

// Slashes at its end do not count. `user`: whose home it is, where "home" is in no share. False, logged, when the path
// does not reach into a share, or is longer than a condition can hold.
[[nodiscard]] bool deriveAddress(const std::string& share, const std::string& realPath, const std::string& user,
                                 RecordAddress& out);

// The address of what lies at `within` in the share of `folder`. False, logged, when a condition cannot hold it.
[[nodiscard]] bool addressWithin(const RecordAddress& folder, const std::string& within, RecordAddress& out);

// The condition "this share and this path", or "... and any path below it". Names are compared as they stand: neither
// test knows a wildcard in them.
class RecordCondition {
 public:
    enum class Reach { kItself, kBelow };
    RecordCondition(const RecordAddress& address, Reach reach);
    RecordCondition(const RecordCondition&) = delete;
    RecordCondition& operator=(const RecordCondition&) = delete;
    [[nodiscard]] const __tag_FI_SQL_COND* get() const { return &path_; }

 private:
    __tag_FI_SQL_COND path_{}, share_{};
};

}  // namespace orvel

#endif
