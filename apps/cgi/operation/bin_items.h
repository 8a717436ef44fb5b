// What lies in a recycle bin, as people deleted it.
//
// What is deleted keeps its path in the bin, so folders above it are made there. Where a deletion is recorded, what it
// took is one item; below a folder that no record knows each file is one, and so is an empty folder: then nobody knows
// who deleted it, and the best that is known of when is the change time.
#ifndef ORVEL_CGI_OPERATION_BIN_ITEMS_H
#define ORVEL_CGI_OPERATION_BIN_ITEMS_H

#include <sys/stat.h>

#include <string>
#include <vector>

#include "base/descriptor.h"
#include "deleted_log.h"

namespace orvel::cgi {

struct BinItem {
    std::string path;       // in the bin
    struct stat status {};  // a link's own
    bool recorded = false;
    long long deleted = 0;  // seconds
    std::string user;       // "" where it is not recorded
};

struct BinItems {
    std::vector<BinItem> list;
    size_t looked = 0;  // entries
    bool cut = false;   // there were more than may be looked at
};

// Adds what the caller may see in the open bin; what they may not read is left out. At most `most` entries are looked
// at in all.
void addBinItems(const Descriptor& bin, const Deletions& deletions, size_t most, BinItems& items);

}  // namespace orvel::cgi

#endif
