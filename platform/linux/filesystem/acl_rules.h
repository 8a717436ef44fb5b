// Facts about an identity and a folder, and what they settle about an entry without asking the kernel.
#ifndef VEXO_LINUX_ACL_RULES_H
#define VEXO_LINUX_ACL_RULES_H

#include <sys/types.h>

#include <cstdint>

#include "vexo/stat.h"

namespace vexo {

// Permission bits here are those of access(2): read 4, write 2, execute 1.

struct Identity {
    uid_t euid;
    bool overrides;  // CAP_DAC_OVERRIDE is effective
    bool readsAll;   // CAP_DAC_READ_SEARCH is effective
    bool ownsAll;    // CAP_FOWNER is effective
};

struct FolderFacts {
    uint64_t device;
    bool plain;      // a local file system on which mode, ACL and capabilities decide alone
    bool readOnly;   // the mount
    bool noExecute;  // the mount
    bool removable;  // entries may be made and removed: write and search granted, not append-only
    bool sticky;
    uid_t owner;
};

struct Settled {
    unsigned granted;
    unsigned open;    // bits that only the kernel can decide
    unsigned likely;  // those of them that everybody but the owner holds, as far as no ACL says otherwise
};

// What `who` holds on an entry of the folder, as far as its status says.
[[nodiscard]] Settled settle(const Identity& who, const FolderFacts& folder, const _tag_VEXOSTAT_& entry);
// Whether `who` may remove the entry.
[[nodiscard]] bool mayRemove(const Identity& who, const FolderFacts& folder, const _tag_VEXOSTAT_& entry);

}  // namespace vexo

#endif
