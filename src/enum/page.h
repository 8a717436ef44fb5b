// From all entries of a listing to the page that was asked for.
#ifndef ORVEL_ENUM_PAGE_H
#define ORVEL_ENUM_PAGE_H

#include <cstddef>
#include <list>
#include <string_view>

#include "orvel/dir_entry.h"

namespace orvel {

struct Paging {
    const char* sortBy;  // null keeps the order
    bool ascending;      // false reverses everything, also without a sort key
    unsigned long offset;
    unsigned long limit;  // 0: everything, whatever the offset
};

// A range of positions, `last` excluded.
struct Range {
    size_t first;
    size_t last;
};

// Where, in ascending order, the entries of the page stand among `total`.
Range pageOf(size_t total, const Paging& paging);

// Sorts stably in the order of EnumCompare(sortBy).
void sortEntries(std::list<DIRENTRY_INFO>& entries, std::string_view sortBy);
void slice(std::list<DIRENTRY_INFO>& entries, unsigned long offset, unsigned long limit);
// Sorts, reverses, counts into `total` and cuts.
void arrange(std::list<DIRENTRY_INFO>& entries, const Paging& paging, unsigned long& total);

}  // namespace orvel

#endif
