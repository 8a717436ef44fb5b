// A share's recycle bin: the folder "#recycle" at its root, or the one of Samba's module where the share has that (then
// it is made when something is deleted), where it exists.
//
// What is deleted goes below it to the path that it had in the share, so that it can be put back. Where that name is
// taken in the bin it is marked, "name (#2).ext"; a name that would itself look marked is marked with 1. A folder above
// that belongs to somebody else, and cannot be written, is passed by in the same way.
#ifndef ORVEL_CGI_OPERATION_RECYCLE_H
#define ORVEL_CGI_OPERATION_RECYCLE_H

#include <optional>
#include <string>

#include "deleted_log.h"
#include "operation/item.h"

namespace orvel::cgi {

// The name in the bin of what was called `name`, the `number`-th of that name from 1 on; and back. Pure.
std::string binName(const std::string& name, int number);
std::string originalName(const std::string& nameInBin);
// As `Transfer` numbers names that are taken; `name` is one of the bin.
std::string nextBinName(const std::string& name, int number, bool isFolder);

class RecycleBin {
 public:
    // The bin of the share of `info`; nothing where it has none (or a link in its place). 0, or a library code when
    // that could not be determined: what is deleted must then not be deleted permanently.
    static int open(const PathInfo& info, std::optional<RecycleBin>& bin);
    // The same, and nothing is made.
    static int openPresent(const PathInfo& info, std::optional<RecycleBin>& bin);

    // Whether the item is the bin itself, and whether it lies in it.
    [[nodiscard]] bool is(const Item& item) const { return item.realPath() == path_; }
    [[nodiscard]] bool holds(const Item& item) const { return item.realPath().starts_with(path_ + "/"); }

    // Opens the place for the item, in `target`, which keeps the folder open; the folders above it are made like those
    // that it lies in. 0, or a library code, after which none made here is left.
    int placeFor(const Item& item, const Owner& owner, Target& target, Entry& place) const;
    // Where the item, which the bin holds, once was: a share-relative path.
    [[nodiscard]] std::string originOf(const Item& item) const;
    // The same of a path in the bin.
    [[nodiscard]] std::string originOf(const std::string& path) const;
    // Removes the folders above the item as far as they are empty.
    void prune(const Item& item) const;

    [[nodiscard]] const Descriptor& folder() const { return folder_; }
    // Its path below the share's root.
    [[nodiscard]] const std::string& name() const { return name_; }
    // Its path as people know it.
    [[nodiscard]] std::string sharePath() const { return "/" + shareName_ + "/" + name_; }

    // What records of its deletions are found by.
    [[nodiscard]] RecordedBin recorded() const { return {definedShareName(shareName_), path_}; }

 private:
    static int open(const PathInfo& info, bool make, std::optional<RecycleBin>& bin);

    Descriptor root_, folder_;      // opened O_PATH
    std::string shareName_, name_;  // its path in the share
    std::string rootPath_, path_;   // real paths
};

}  // namespace orvel::cgi

#endif
