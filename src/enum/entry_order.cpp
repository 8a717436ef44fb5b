#include "enum/entry_order.h"

#include <algorithm>
#include <array>
#include <utility>

#include "vexo/text.h"

namespace orvel {
namespace {

struct ColumnName {
    std::string_view name;
    Column column;
    int additional;  // fills the column
};

constexpr std::array kColumns = {
    ColumnName{"size", Column::Size, ADDITIONAL_SIZE},         ColumnName{"mtime", Column::ModifyTime, ADDITIONAL_TIME},
    ColumnName{"crtime", Column::CreateTime, ADDITIONAL_TIME}, ColumnName{"ctime", Column::ChangeTime, ADDITIONAL_TIME},
    ColumnName{"atime", Column::AccessTime, ADDITIONAL_TIME},  ColumnName{"user", Column::User, ADDITIONAL_OWNER},
    ColumnName{"group", Column::Group, ADDITIONAL_OWNER},      ColumnName{"posix", Column::Mode, ADDITIONAL_PERM},
    ColumnName{"type", Column::Type, ADDITIONAL_TYPE},
};

const ColumnName* find(std::string_view sortBy) {
    const auto* found = std::find_if(kColumns.begin(), kColumns.end(), [&](const auto& c) { return c.name == sortBy; });
    return found == kColumns.end() ? nullptr : found;
}

constexpr uint32_t kPermissionBits = 0x1FF;
constexpr size_t kUsualKeyLength = 24;

size_t commonLength(std::string_view a, std::string_view b) {
    const size_t limit = std::min(a.size(), b.size());
    return static_cast<size_t>(std::mismatch(a.begin(), a.begin() + static_cast<ptrdiff_t>(limit), b.begin()).first -
                               a.begin());
}

// The first eight bytes as a number that orders as they do; a shorter text is filled up with zeros.
uint64_t prefixOf(std::string_view text) {
    uint64_t prefix = 0;
    for (size_t i = 0; i < sizeof prefix; ++i) {
        prefix = prefix << 8 | (i < text.size() ? static_cast<unsigned char>(text[i]) : 0U);
    }
    return prefix;
}

}  // namespace

Column columnOf(std::string_view sortBy) {
    const ColumnName* found = find(sortBy);
    return found == nullptr ? Column::Name : found->column;
}

int widened(int additional, const char* sortBy) {
    const ColumnName* found = sortBy == nullptr ? nullptr : find(sortBy);
    return found == nullptr ? additional : additional | found->additional;
}

Figures figuresOf(const DIRENTRY_INFO& info) {
    return {info.isDirectory, info.size,  info.mode, info.mtime, info.crtime,
            info.ctime,       info.atime, info.uid,  info.gid};
}

Figures figuresOf(bool isDirectory, const _tag_VEXOSTAT_& status) {
    const auto seconds = [](int64_t time) { return static_cast<uint32_t>(time); };
    return {isDirectory,
            status.st_size,
            status.st_mode,
            seconds(status.st_modify),
            seconds(status.st_create),
            seconds(status.st_change),
            seconds(status.st_access),
            status.st_uid,
            status.st_gid};
}

int64_t columnValue(Column column, const Figures& figures) {
    switch (column) {
        case Column::Size:
            return figures.isDirectory ? 0 : figures.size;  // folders keep the order of their names
        case Column::ModifyTime:
            return figures.mtime;
        case Column::CreateTime:
            return figures.crtime;
        case Column::ChangeTime:
            return figures.ctime;
        case Column::AccessTime:
            return figures.atime;
        case Column::User:
            return figures.uid;
        case Column::Group:
            return figures.gid;
        case Column::Mode:
            return figures.mode & kPermissionBits;
        case Column::Name:
        case Column::Type:
            break;
    }
    return 0;
}

EntryOrder::EntryOrder(Column column, size_t expected) : column_(column) {
    items_.reserve(expected);
    keyEnds_.reserve(expected);
    keys_.reserve(expected * kUsualKeyLength);
}

void EntryOrder::add(const Figures& figures, std::string_view name, std::string_view type) {
    int64_t value = columnValue(column_, figures);
    if (column_ == Column::Type) {
        std::string folded;
        VEXO::AppendFoldKey(type, folded);
        value = types_.try_emplace(std::move(folded), static_cast<int64_t>(types_.size())).first->second;
    }
    items_.push_back({value, 0, static_cast<uint32_t>(items_.size()), !figures.isDirectory});
    VEXO::AppendFoldKey(name, keys_);
    keyEnds_.push_back(keys_.size());
}

std::string_view EntryOrder::key(size_t position) const {
    const size_t begin = position == 0 ? 0 : keyEnds_[position - 1];
    return std::string_view(keys_).substr(begin, keyEnds_[position] - begin);
}

bool EntryOrder::before(const Item& a, const Item& b) const {
    if (a.isFile != b.isFile) return b.isFile;
    if (a.value != b.value) return a.value < b.value;
    if (a.prefix != b.prefix) return a.prefix < b.prefix;
    const int difference = key(a.position).compare(key(b.position));
    return difference != 0 ? difference < 0 : a.position < b.position;
}

// Types were numbered as they came; the map holds them in order.
void EntryOrder::rankTypes() {
    std::vector<int64_t> ranks(types_.size());
    int64_t rank = 0;
    for (const auto& type : types_) ranks[static_cast<size_t>(type.second)] = rank++;
    for (Item& item : items_) item.value = ranks[static_cast<size_t>(item.value)];
}

// Names of one folder often begin alike ("IMG_2024..."): what all share would make every prefix the same.
void EntryOrder::fillPrefixes() {
    if (items_.empty()) return;
    size_t common = key(0).size();
    for (const Item& item : items_) common = commonLength(key(0).substr(0, common), key(item.position));
    for (Item& item : items_) item.prefix = prefixOf(key(item.position).substr(common));
}

std::vector<size_t> EntryOrder::take(size_t first, size_t last) {
    if (column_ == Column::Type) rankTypes();
    fillPrefixes();
    const auto less = [this](const Item& a, const Item& b) { return before(a, b); };
    const auto begin = items_.begin() + static_cast<ptrdiff_t>(first);
    const auto end = items_.begin() + static_cast<ptrdiff_t>(last);
    // No two items are equal, so selecting and sorting need not be stable.
    if (first > 0) std::nth_element(items_.begin(), begin, items_.end(), less);
    if (last < items_.size()) std::nth_element(begin, end, items_.end(), less);
    std::sort(begin, end, less);
    std::vector<size_t> positions;
    positions.reserve(last - first);
    std::for_each(begin, end, [&](const Item& item) { positions.push_back(item.position); });
    return positions;
}

}  // namespace orvel
