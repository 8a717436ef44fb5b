// The names of a share's index in the order of pages sorted by name, packed in a file beside it: a search by name reads
// them far faster than it reads records.
#ifndef VEXO_LINUX_INDEX_NAMES_H
#define VEXO_LINUX_INDEX_NAMES_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "index/index_database.h"
#include "index/index_names_format.h"

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
    [[nodiscard]] int64_t id(size_t position) const { return numberAt<uint32_t>(sizeof(NamesHead), position); }
    // The number that stands for the extension.
    [[nodiscard]] uint16_t extension(size_t position) const { return numberAt<uint16_t>(extensionsAt_, position); }
    // Calls `take(text)` with the extension that each number stands for, from 1 on.
    template <class Take>
    void eachExtension(Take take) const {
        for (std::string_view left = list_; !left.empty();) {
            const std::string_view text = left.substr(0, left.find('\0'));
            take(text);
            left.remove_prefix(text.size() + 1);
        }
    }
    // The names from the first one of a block on, a NUL behind each.
    [[nodiscard]] std::string_view textsOfBlock(size_t block) const;

 private:
    Names(const char* mapped, size_t size) : mapped_(mapped), size_(size) {}
    [[nodiscard]] bool read(int64_t index);
    template <class Number>
    [[nodiscard]] Number numberAt(uint64_t offset, size_t position) const {
        Number number = 0;
        memcpy(&number, mapped_ + offset + position * sizeof number, sizeof number);
        return number;
    }

    const char* mapped_;
    size_t size_;
    size_t count_ = 0;
    int64_t highest_ = 0;
    uint64_t extensionsAt_ = 0, blocksAt_ = 0;
    std::string_view texts_, list_;
};

// Goes through names in their order or against it; equal ones come in their order either way. A damaged file gives
// names that are not there, never what lies beside it.
class NamesCursor {
 public:
    // `wanted` says by an extension's number whether such names are to come; all of them where it is empty.
    NamesCursor(const Names& names, bool descending, std::vector<bool> wanted);
    // False at the end.
    [[nodiscard]] bool next();
    [[nodiscard]] std::string_view name() { return nameAt(at_); }
    [[nodiscard]] int64_t id() const { return names_->id(at_); }

 private:
    [[nodiscard]] bool nextAscending();
    [[nodiscard]] bool nextDescending();
    [[nodiscard]] bool isWanted(size_t at) const { return wanted_.empty() || wanted_[names_->extension(at)]; }
    [[nodiscard]] std::string_view nameAt(size_t at);

    const Names* names_;
    bool descending_;
    std::vector<bool> wanted_;
    size_t at_;           // the current one
    size_t end_, first_;  // of those that equal it, against the order
    size_t block_;        // whose names these are
    std::array<std::string_view, kNamesOfBlock> texts_;
};

// Whether so much has changed since the names were packed that it is time to do it again.
[[nodiscard]] bool namesAreOld(const std::string& path, Database& index);
// Packs the names of the index that is open, for `path`. False with the slot filled; the file is then what it was.
[[nodiscard]] bool packNames(const std::string& path, Database& index);

}  // namespace vexo::fileindex

#endif
