#include "enum/page.h"

#include <algorithm>
#include <vector>

#include "core/boundary.h"
#include "enum/entry_order.h"
#include "orvel/listing.h"
#include "vexo/text.h"

namespace orvel {
namespace {

// What a C string comparison of the text sees: a record of a caller could hold a NUL.
std::string_view untilNul(const std::string& text) {
    return text.c_str();
}

}  // namespace

Range pageOf(size_t total, const Paging& paging) {
    if (paging.limit == 0) return {0, total};
    const size_t begin = std::min<size_t>(paging.offset, total);
    const size_t end = begin + std::min<size_t>(paging.limit, total - begin);
    return paging.ascending ? Range{begin, end} : Range{total - end, total - begin};
}

void sortEntries(std::list<DIRENTRY_INFO>& entries, std::string_view sortBy) {
    EntryOrder order(columnOf(sortBy), entries.size());
    std::vector<std::list<DIRENTRY_INFO>::iterator> nodes;
    nodes.reserve(entries.size());
    for (auto entry = entries.begin(); entry != entries.end(); ++entry) {
        nodes.push_back(entry);
        order.add(figuresOf(*entry), untilNul(entry->name), untilNul(entry->type));
    }
    for (const size_t position : order.take(0, nodes.size())) entries.splice(entries.end(), entries, nodes[position]);
}

void slice(std::list<DIRENTRY_INFO>& entries, unsigned long offset, unsigned long limit) {
    if (entries.empty() || limit == 0) return;
    const auto advanced = [&](unsigned long steps) {
        return std::next(entries.begin(), static_cast<ptrdiff_t>(std::min<size_t>(steps, entries.size())));
    };
    entries.erase(entries.begin(), advanced(offset));
    entries.erase(advanced(limit), entries.end());
}

void arrange(std::list<DIRENTRY_INFO>& entries, const Paging& paging, unsigned long& total) {
    if (paging.sortBy != nullptr) sortEntries(entries, paging.sortBy);
    if (!paging.ascending) entries.reverse();
    total = entries.size();
    slice(entries, paging.offset, paging.limit);
}

}  // namespace orvel

bool EnumCompare::operator()(const DIRENTRY_INFO& a, const DIRENTRY_INFO& b) const {
    if (a.isDirectory != b.isDirectory) return a.isDirectory;
    const orvel::Column column = orvel::columnOf(sortBy_);
    const int64_t valueA = orvel::columnValue(column, orvel::figuresOf(a));
    const int64_t valueB = orvel::columnValue(column, orvel::figuresOf(b));
    if (valueA != valueB) return valueA < valueB;
    if (column == orvel::Column::Type) {
        const int difference = VLIBCUnicodeUTF8StrCaseCmp(a.type.c_str(), b.type.c_str());
        if (difference != 0) return difference < 0;
    }
    return VLIBCUnicodeUTF8StrCaseCmp(a.name.c_str(), b.name.c_str()) < 0;
}

void OrvEnum::EntryListSort(std::list<DIRENTRY_INFO>& entries, std::string sortBy) {
    orvel::guarded(false, [&] {
        orvel::sortEntries(entries, sortBy);
        return true;
    });
}

void OrvEnum::OrvLibDirEntrySlice(std::list<DIRENTRY_INFO>& entries, unsigned long offset, unsigned long limit) {
    orvel::guarded(false, [&] {
        orvel::slice(entries, offset, limit);
        return true;
    });
}
