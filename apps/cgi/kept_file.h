// The file of a kept listing: which names a folder showed, in which order. See docs/formats/kept-listings.md.
//
// Whoever it belongs to may write anything into it, so nothing in it is believed: neither its numbers, nor that a name
// is one that a folder may show.
#ifndef ORVEL_CGI_KEPT_FILE_H
#define ORVEL_CGI_KEPT_FILE_H

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"

namespace orvel::cgi {

struct KeptRow {
    std::string name;
    bool isFolder = false;
};

// Which folder it is, and when its names changed last.
struct FolderState {
    uint64_t device = 0, inode = 0;
    int64_t modified = 0, modifiedNs = 0, changed = 0, changedNs = 0;
    [[nodiscard]] bool isSameFolder(const FolderState& other) const {
        return device == other.device && inode == other.inode;
    }
    bool operator==(const FolderState&) const = default;
};
// False with errno.
[[nodiscard]] bool stateOf(const Descriptor& folder, FolderState& state);

// What a listing shows.
struct KeptAbout {
    std::string path;     // share-relative, of the folder
    std::string pattern;  // as a request has it
    int type = 0;         // DIR_ENTRY_TYPE_...
    FolderState folder;
};

// Puts the bytes of a file together.
class KeptText {
 public:
    void add(std::string_view name, bool isFolder);
    [[nodiscard]] uint32_t rows() const { return rows_; }
    // What the file comes to so far.
    [[nodiscard]] size_t size() const { return blocks_.size(); }
    // The whole file.
    [[nodiscard]] std::string finish(const KeptAbout& about);

 private:
    void closeBlock();

    std::string blocks_;
    std::string table_;
    size_t begin_ = 0;  // of the block at work
    uint32_t rows_ = 0;
};

// Reads one. Only the blocks that hold the rows asked for are read.
class KeptFile {
 public:
    static constexpr uint32_t kRowsInBlock = 256;

    // False for what is no such file, or is not whole.
    [[nodiscard]] bool open(Descriptor file);
    [[nodiscard]] const KeptAbout& about() const { return about_; }
    [[nodiscard]] uint32_t rows() const { return rows_; }
    [[nodiscard]] const Descriptor& file() const { return file_; }

    // One row, which must be below rows(). False when its block is damaged.
    [[nodiscard]] bool row(uint32_t number, KeptRow& row);
    // Calls `take` with the rows from `first` to before `end` until it returns false. False when a block is damaged.
    [[nodiscard]] bool each(uint32_t first, uint32_t end,
                            const std::function<bool(uint32_t number, const KeptRow& row)>& take);

 private:
    struct Block {
        uint64_t offset, hash;
        uint32_t length;
    };
    bool readTable(std::string_view table, uint64_t begin, uint64_t size);
    bool load(uint32_t block);

    Descriptor file_;
    KeptAbout about_;
    uint32_t rows_ = 0;
    std::vector<Block> blocks_;
    std::vector<KeptRow> loaded_;  // the rows of one block
    uint32_t loadedBlock_ = UINT32_MAX;
};

}  // namespace orvel::cgi

#endif
