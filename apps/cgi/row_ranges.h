// Rows of a list, said as ranges.
#ifndef ORVEL_CGI_ROW_RANGES_H
#define ORVEL_CGI_ROW_RANGES_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace orvel::cgi {

// From the first row to the last one, both included.
struct RowRange {
    uint32_t first, last;
    bool operator==(const RowRange&) const = default;
};

// "0-99,120,200-299" of a list of `total` rows. Nothing for anything else: an empty text, ranges that are not in order,
// overlap, are reversed or reach past the end. Pure, as what follows.
std::optional<std::vector<RowRange>> parseRanges(std::string_view text, uint32_t total);

// The ranges without the exceptions. Nothing when one of these is not in them.
std::optional<std::vector<RowRange>> withoutRows(const std::vector<RowRange>& ranges,
                                                 const std::vector<RowRange>& exceptions);

std::string rangesText(const std::vector<RowRange>& ranges);

// The rows of ranges, counted from 0 on.
class ChosenRowNumbers {
 public:
    explicit ChosenRowNumbers(std::vector<RowRange> ranges = {});
    [[nodiscard]] size_t size() const { return size_; }
    [[nodiscard]] uint32_t operator[](size_t position) const;
    [[nodiscard]] const std::vector<RowRange>& ranges() const { return ranges_; }

 private:
    std::vector<RowRange> ranges_;
    std::vector<size_t> starts_;  // how many rows lie before each range
    size_t size_ = 0;
};

}  // namespace orvel::cgi

#endif
