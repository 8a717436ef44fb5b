// The order of listed entries: the columns, and a sort by keys that are folded once per entry.
#ifndef ORVEL_ENUM_ENTRY_ORDER_H
#define ORVEL_ENUM_ENTRY_ORDER_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "orvel/dir_entry.h"
#include "vexo/stat.h"

namespace orvel {

enum class Column { Name, Size, ModifyTime, CreateTime, ChangeTime, AccessTime, User, Group, Mode, Type };

// The column that a sort key names; Name for any other text.
Column columnOf(std::string_view sortBy);
// `additional` with the bit that fills the column of `sortBy` (null: none).
int widened(int additional, const char* sortBy);

// The numbers of an entry that a column can order by.
struct Figures {
    bool isDirectory;
    int64_t size;
    uint32_t mode, mtime, crtime, ctime, atime, uid, gid;
};
Figures figuresOf(const DIRENTRY_INFO& info);
Figures figuresOf(bool isDirectory, const _tag_VEXOSTAT_& status);

// What two entries of one kind are compared by first, before their types and names; 0 where the column has no number.
int64_t columnValue(Column column, const Figures& figures);

// Orders entries exactly as a stable sort with EnumCompare does: each entry's name is folded once, most comparisons
// look at two numbers.
class EntryOrder {
 public:
    EntryOrder(Column column, size_t expected);
    // Adds the next entry. `type` counts for Column::Type alone.
    void add(const Figures& figures, std::string_view name, std::string_view type);
    // The positions (by addition) of the entries that come `first`-th to before `last`-th, in ascending order. Entries
    // outside that range are only put aside, not sorted. Call once.
    std::vector<size_t> take(size_t first, size_t last);

 private:
    struct Item {
        int64_t value;
        uint64_t prefix;    // of the name's key, behind what all keys begin with
        uint32_t position;  // four thousand million entries do not fit into memory
        bool isFile;
    };
    [[nodiscard]] std::string_view key(size_t position) const;
    [[nodiscard]] bool before(const Item& a, const Item& b) const;
    void rankTypes();
    void fillPrefixes();

    Column column_;
    std::vector<Item> items_;
    std::string keys_;  // the folded names, one behind the other
    std::vector<size_t> keyEnds_;
    std::map<std::string, int64_t> types_;  // folded type to the number that its items carry as value
};

}  // namespace orvel

#endif
