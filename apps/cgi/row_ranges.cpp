#include "row_ranges.h"

#include <algorithm>
#include <charconv>
#include <utility>

namespace orvel::cgi {
namespace {

std::optional<uint32_t> parseRow(std::string_view text) {
    uint32_t row = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), row);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return row;
}

std::optional<RowRange> parseRange(std::string_view text) {
    const size_t dash = text.find('-');
    const auto first = parseRow(text.substr(0, dash));
    const auto last = dash == std::string_view::npos ? first : parseRow(text.substr(dash + 1));
    if (!first || !last || *last < *first) return std::nullopt;
    return RowRange{*first, *last};
}

}  // namespace

std::optional<std::vector<RowRange>> parseRanges(std::string_view text, uint32_t total) {
    std::vector<RowRange> ranges;
    for (bool more = true; more;) {
        const size_t comma = text.find(',');
        const auto range = parseRange(text.substr(0, comma));
        if (!range || range->last >= total) return std::nullopt;
        if (!ranges.empty() && range->first <= ranges.back().last) return std::nullopt;
        ranges.push_back(*range);
        more = comma != std::string_view::npos;
        if (more) text.remove_prefix(comma + 1);
    }
    return ranges;
}

std::optional<std::vector<RowRange>> withoutRows(const std::vector<RowRange>& ranges,
                                                 const std::vector<RowRange>& exceptions) {
    std::vector<RowRange> left;
    auto exception = exceptions.begin();
    for (RowRange range : ranges) {
        bool some = true;  // of the range is left
        for (; exception != exceptions.end() && exception->first <= range.last; ++exception) {
            if (!some || exception->first < range.first || exception->last > range.last) return std::nullopt;
            if (exception->first > range.first) left.push_back({range.first, exception->first - 1});
            some = exception->last < range.last;
            if (some) range.first = exception->last + 1;
        }
        if (some) left.push_back(range);
    }
    if (exception != exceptions.end()) return std::nullopt;
    return left;
}

std::string rangesText(const std::vector<RowRange>& ranges) {
    std::string text;
    for (const RowRange& range : ranges) {
        if (!text.empty()) text += ',';
        text += std::to_string(range.first);
        if (range.last != range.first) text += "-" + std::to_string(range.last);
    }
    return text;
}

ChosenRowNumbers::ChosenRowNumbers(std::vector<RowRange> ranges) : ranges_(std::move(ranges)) {
    starts_.reserve(ranges_.size());
    for (const RowRange& range : ranges_) {
        starts_.push_back(size_);
        size_ += size_t{range.last} - range.first + 1;
    }
}

uint32_t ChosenRowNumbers::operator[](size_t position) const {
    const auto after = std::upper_bound(starts_.begin(), starts_.end(), position);
    const auto at = static_cast<size_t>(after - starts_.begin()) - 1;
    return ranges_[at].first + static_cast<uint32_t>(position - starts_[at]);
}

}  // namespace orvel::cgi
