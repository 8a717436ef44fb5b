#include "index/index_sort.h"

#include <algorithm>
#include <cstring>
#include <limits>

#include "vexo/text.h"

namespace vexo::fileindex {
namespace {

void invertFrom(size_t start, std::string& text) {
    for (size_t i = start; i < text.size(); ++i) text[i] = static_cast<char>(~text[i]);
}

uint64_t prefixOf(std::string_view key) {
    uint64_t prefix = 0;
    memcpy(&prefix, key.data(), std::min(key.size(), sizeof prefix));
    return __builtin_bswap64(prefix);
}

}  // namespace

void appendKey(std::string_view text, bool descending, std::string& out) {
    // No text holds a NUL, so one behind each part lets a shorter text stand before a longer one.
    const size_t start = out.size();
    VEXO::AppendFoldKey(text, out);
    out += '\0';
    out += text;
    out += '\0';
    if (descending) invertFrom(start, out);
}

void appendKey(int64_t number, bool descending, std::string& out) {
    const size_t start = out.size();
    const uint64_t shifted = static_cast<uint64_t>(number) ^ (uint64_t{1} << 63);
    for (int bits = 56; bits >= 0; bits -= 8) out += static_cast<char>(shifted >> bits);
    if (descending) invertFrom(start, out);
}

void Sorter::rank(int64_t id) {
    ranks_.resize(ids_.size(), std::numeric_limits<uint32_t>::max());
    if (ids_.empty() || id < ids_.front()) return;
    // Ids mostly have no gaps, and then lie where they should.
    const auto expected = static_cast<uint64_t>(id) - static_cast<uint64_t>(ids_.front());
    size_t at = expected;
    if (expected >= ids_.size() || ids_[at] != id) {
        at = static_cast<size_t>(std::lower_bound(ids_.begin(), ids_.end(), id) - ids_.begin());
    }
    if (at < ids_.size() && ids_[at] == id) ranks_[at] = named_++;
}

std::string_view Sorter::keyOf(size_t index) const {
    const uint64_t start = index == 0 ? 0 : ends_[index - 1];
    return std::string_view(keys_).substr(start, ends_[index] - start);
}

std::vector<int64_t> Sorter::sorted(size_t first, size_t count) {
    ranks_.resize(ids_.size(), std::numeric_limits<uint32_t>::max());
    std::vector<Entry> entries;
    entries.reserve(ids_.size());
    for (size_t i = 0; i < ids_.size(); ++i) {
        entries.push_back({prefixOf(keyOf(i)), static_cast<uint32_t>(i), ranks_[i]});
    }
    const auto before = [this](const Entry& a, const Entry& b) {
        if (a.prefix != b.prefix) return a.prefix < b.prefix;
        const int difference = keyOf(a.index).compare(keyOf(b.index));
        return difference != 0 ? difference < 0 : a.rank < b.rank;
    };
    const size_t from = std::min(first, entries.size());
    const size_t to = from + std::min(count, entries.size() - from);
    const auto at = [&](size_t position) { return entries.begin() + static_cast<std::ptrdiff_t>(position); };
    // Only the page itself is put in order.
    if (to < entries.size()) std::nth_element(entries.begin(), at(to), entries.end(), before);
    if (from > 0) std::nth_element(entries.begin(), at(from), at(to), before);
    std::sort(at(from), at(to), before);
    std::vector<int64_t> ids;
    ids.reserve(to - from);
    for (size_t i = from; i < to; ++i) ids.push_back(ids_[entries[i].index]);
    return ids;
}

}  // namespace vexo::fileindex
