// Sorting of many records by keys of any length. Pure.
#ifndef VEXO_LINUX_INDEX_SORT_H
#define VEXO_LINUX_INDEX_SORT_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace vexo::fileindex {

// Appends a key to `out`; keys that consist of the same parts in the same directions order bytewise. Texts order
// without case, then by their bytes.
void appendKey(std::string_view text, bool descending, std::string& out);
void appendKey(int64_t number, bool descending, std::string& out);

class Sorter {
 public:
    // Adds a record, its key built by `build(std::string&)`. Ids must ascend.
    template <class Build>
    void add(int64_t id, Build build) {
        build(keys_);
        ends_.push_back(keys_.size());
        ids_.push_back(id);
    }
    // Tells the records of equal keys apart: those named earlier stand first, those never named last.
    void rank(int64_t id);
    // The ids at the positions from `first` on, `count` of them at most.
    [[nodiscard]] std::vector<int64_t> sorted(size_t first, size_t count);

 private:
    struct Entry {
        uint64_t prefix;  // of the key
        uint32_t index;
        uint32_t rank;
    };
    [[nodiscard]] std::string_view keyOf(size_t index) const;

    std::string keys_;
    std::vector<uint64_t> ends_;
    std::vector<int64_t> ids_;
    std::vector<uint32_t> ranks_;
    uint32_t named_ = 0;
};

}  // namespace vexo::fileindex

#endif
