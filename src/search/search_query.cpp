// Pages of a task's results.
#include <syslog.h>

#include <cstring>
#include <iterator>

#include "base/printable.h"
#include "core/boundary.h"
#include "orvel/search_criteria.h"
#include "orvel/search_task.h"
#include "orvel/search_walker.h"

namespace FileSearch {
namespace {

constexpr const char* kSource = "orvelsearch";

struct SortWord {
    const char* word;
    __tag_FI_SQL_COND_TYPE column;
};

constexpr SortWord kSortWords[] = {
    {"size", FI_COL_SIZE},         {"mtime", FI_COL_MODIFY_TIME}, {"crtime", FI_COL_CREATE_TIME},
    {"ctime", FI_COL_CHANGE_TIME}, {"atime", FI_COL_ACCESS_TIME}, {"user", FI_COL_OWNER},
    {"group", FI_COL_GROUP},       {"posix", FI_COL_PERMISSION},  {"type", FI_COL_TYPE},
};

__tag_FI_SQL_COND_TYPE columnOf(const char* word) {
    for (const SortWord& sort : kSortWords) {
        if (strcmp(word, sort.word) == 0) return sort.column;
    }
    return FI_COL_NAME;
}

void setOrder(const char* sortBy, const bool* sortFlag, FIQUERY& query) {
    const bool asked = sortBy != nullptr && sortFlag != nullptr;
    const bool ascending = !asked || *sortFlag;
    query.nSort = 1;
    if (asked && strcmp(sortBy, "ppath") == 0) {
        query.sort[0] = {FI_COL_PARENT, ascending ? 0 : 1};
        query.sort[1] = {FI_COL_SHARE, ascending ? 1 : 0};  // kept: against the first key's direction
        query.nSort = 2;
    } else {
        query.sort[0] = {asked ? columnOf(sortBy) : FI_COL_NAME, ascending ? 0 : 1};
    }
}

// The conditions of a page; they stay where they are while a query borrows them.
class Filters {
 public:
    Filters(const _tag_dir_entry_type_* type, const char* name) {
        const bool byName = name != nullptr && *name != '\0';
        if (byName) {
            setSqlCond(name_, FI_COL_NAME, FI_OP_WILDCARD, std::string("*") + name + "*", nullptr, nullptr);
            first_ = &name_;
        }
        if (type != nullptr && *type != DIR_ENTRY_TYPE_ALL) {
            setSqlCond(type_, FI_COL_IS_DIR, FI_OP_EQUAL, *type == DIR_ENTRY_TYPE_DIR ? 1ULL : 0ULL, first_, nullptr);
            first_ = &type_;
        }
    }
    Filters(const Filters&) = delete;
    Filters& operator=(const Filters&) = delete;
    [[nodiscard]] const __tag_FI_SQL_COND* first() const { return first_; }

 private:
    __tag_FI_SQL_COND type_{}, name_{};
    __tag_FI_SQL_COND* first_ = nullptr;
};

}  // namespace

void OrvSearchWalker::setShownOrder(const char* sortBy, const bool* sortFlag) {
    FIQUERY query{};
    setOrder(sortBy, sortFlag, query);
    shown_.reset();
    if (query.nSort == 1) shown_ = query.sort[0];
}

bool OrvSearchDBTask::queryResult(unsigned long offset, unsigned long limit, const char* sortBy, const bool* sortFlag,
                                  const _tag_dir_entry_type_* typeFilter, const char* nameFilter,
                                  BOOL (*callback)(__tag_FI_FILE_INFO_DATA*, void*), void* userData,
                                  unsigned long long* count) {
    return orvel::guardedQuietly(false, [&] {
        if (limit == 0 || count == nullptr) return false;
        const Filters filters(typeFilter, nameFilter);
        FIQUERY query{};
        setOrder(sortBy, sortFlag, query);
        query.cond = filters.first();
        query.offset = offset;
        query.limit = limit;
        if (FILEIDXCountGet(filePath_.c_str(), &query, count) < 0) {
            syslog(LOG_ERR, "%s:%d Fail to Select the record from DB %s", kSource, __LINE__,
                   orvel::printable(filePath_).c_str());
            return false;
        }
        if (FILEIDXDBSelect(filePath_.c_str(), &query, callback, userData) < 0) {
            syslog(LOG_ERR, "%s:%d Fail to select data from DB %s", kSource, __LINE__,
                   orvel::printable(filePath_).c_str());
            return false;
        }
        return true;
    });
}

}  // namespace FileSearch
