// Opening of a folder inside another one, no link followed.
#ifndef ORVEL_ENUM_FOLDER_ENTRY_H
#define ORVEL_ENUM_FOLDER_ENTRY_H

#include <cstdint>

#include "core/given_folder.h"

namespace orvel {

struct FolderIdentity {
    uint64_t device;
    uint64_t inode;
    bool operator==(const FolderIdentity&) const = default;
};

// False with errno.
[[nodiscard]] bool identify(int fd, FolderIdentity& identity);

// Makes the folder `name` of `parent` the current directory and opens it. No link is followed; which folder stands
// under the name is not asked further, since not every file system numbers a folder the same way twice.
EnteredFolder enterFolder(int parent, const char* name);

// A descriptor of the folder `name` of `parent` that serves as a place alone, without following a link. Null with
// errno, ESTALE when it is not the `expected` folder. A folder keeps its identity while one below it is open.
Descriptor reopenFolder(int parent, const char* name, const FolderIdentity& expected);

}  // namespace orvel

#endif
