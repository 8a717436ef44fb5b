// Opening of a folder inside another one, so that what is opened is the folder that was met there.
#ifndef ORVEL_ENUM_FOLDER_ENTRY_H
#define ORVEL_ENUM_FOLDER_ENTRY_H

#include <cstdint>

#include "core/owned.h"

namespace orvel {

struct FolderIdentity {
    uint64_t device;
    uint64_t inode;
    bool operator==(const FolderIdentity&) const = default;
};

// False with errno.
[[nodiscard]] bool identify(int fd, FolderIdentity& identity);

enum class EntryFailure { kChangeDirectory, kOpen };

struct EnteredFolder {
    Descriptor folder;  // for reading; null on failure
    FolderIdentity identity;
    EntryFailure failure;
    int error;  // errno of the failure; ESTALE when another folder took the place
};

// Makes the folder `name` of `parent` the current directory and opens it. No link is followed, and the folder must be
// the `expected` one or the root of a mount (one that is mounted when it is first entered had another status before).
EnteredFolder enterFolder(int parent, const char* name, const FolderIdentity& expected);

// A descriptor of the folder `name` of `parent` that serves as a place alone, without following a link. Null with
// errno, ESTALE when it is not the `expected` folder.
Descriptor reopenFolder(int parent, const char* name, const FolderIdentity& expected);

}  // namespace orvel

#endif
