// The names of a share's index in the order of pages sorted by name, packed in a file beside it: a search by name reads
// them far faster than it reads records.
#ifndef VEXO_LINUX_INDEX_NAMES_H
#define VEXO_LINUX_INDEX_NAMES_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "index/index_database.h"

namespace vexo::fileindex {

// Such a file as it was when it was opened; replacing it changes nothing here. It may name records that are gone by
// now, and lacks those that came since: their ids are higher than `highest`.
class Names {
 public:
    // Null where there is none, it cannot be trusted, or it was made for another index than the one that is open.
    // Nothing is reported: searches do without it.
    [[nodiscard]] static std::unique_ptr<const Names> open(const std::string& path, Database& index);
    ~Names();
    Names(const Names&) = delete;
    Names& operator=(const Names&) = delete;

    [[nodiscard]] size_t count() const { return count_; }
    [[nodiscard]] int64_t highest() const { return highest_; }
    [[nodiscard]] int64_t id(size_t position) const;
    // All of them, a NUL behind each.
    [[nodiscard]] std::string_view texts() const { return texts_; }

 private:
    Names(const char* mapped, size_t size) : mapped_(mapped), size_(size) {}
    [[nodiscard]] bool read(int64_t index);

    const char* mapped_;
    size_t size_;
    size_t count_ = 0;
    int64_t highest_ = 0;
    std::string_view texts_;
};

// Goes through names in their order or against it; equal ones come in their order either way.
class NamesCursor {
 public:
    NamesCursor(const Names& names, bool descending);
    // False at the end.
    [[nodiscard]] bool next();
    [[nodiscard]] std::string_view name() const { return name_; }
    [[nodiscard]] int64_t id() const { return names_->id(at_); }

 private:
    [[nodiscard]] bool nextAscending();
    [[nodiscard]] bool nextDescending();

    const Names* names_;
    bool descending_;
    std::string_view left_;  // texts that are still to come
    std::string_view name_;
    size_t at_, end_;  // the current one, and where those that equal it end
    size_t first_;     // of them
};

// Whether so much has changed since the names were packed that it is time to do it again.
[[nodiscard]] bool namesAreOld(const std::string& path, Database& index);
// Packs the names of the index that is open, for `path`. False with the slot filled; the file is then what it was.
[[nodiscard]] bool packNames(const std::string& path, Database& index);

}  // namespace vexo::fileindex

#endif
