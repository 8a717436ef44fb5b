#include "filesystem/acl_rules.h"

#include <sys/stat.h>
#include <unistd.h>

namespace vexo {
namespace {

constexpr unsigned kAll = R_OK | W_OK | X_OK;
constexpr unsigned kUnmappedId = 65534;  // stands for any id that a user namespace or a mount does not map

}  // namespace

Settled settle(const Identity& who, const FolderFacts& folder, const _tag_VEXOSTAT_& entry) {
    const bool isFile = S_ISREG(entry.st_mode);
    const bool known = folder.plain && entry.st_device == folder.device &&
                       (entry.st_attributes & VEXO_ATTRIBUTE_KNOWN) != 0 && (isFile || S_ISDIR(entry.st_mode)) &&
                       entry.st_uid != kUnmappedId && entry.st_gid != kUnmappedId;
    if (!known || (who.readsAll && !who.overrides)) return {0, kAll, 0};

    Settled settled{};
    if (who.overrides) {
        const bool executable = !isFile || (entry.st_mode & 0111) != 0;
        settled.granted = R_OK | W_OK | (executable ? X_OK : 0);
    } else if (entry.st_uid == who.euid) {
        settled.granted = (entry.st_mode >> 6) & kAll;  // an ACL says nothing else about the owner
    } else {
        // The group bits are the ACL's mask too: no entry of an ACL grants more than these or the bits of all others.
        const unsigned group = (entry.st_mode >> 3) & kAll;
        const unsigned others = entry.st_mode & kAll;
        settled.open = group | others;
        settled.likely = group & others;
    }
    unsigned refused = 0;
    if (folder.readOnly || (entry.st_attributes & VEXO_ATTRIBUTE_IMMUTABLE) != 0) refused |= W_OK;
    if (folder.noExecute && isFile) refused |= X_OK;
    settled.granted &= ~refused;
    settled.open &= ~refused;
    settled.likely &= ~refused;
    return settled;
}

bool mayRemove(const Identity& who, const FolderFacts& folder, const _tag_VEXOSTAT_& entry) {
    if (!folder.removable) return false;
    if ((entry.st_attributes & (VEXO_ATTRIBUTE_IMMUTABLE | VEXO_ATTRIBUTE_APPEND)) != 0) return false;
    return !folder.sticky || entry.st_uid == who.euid || folder.owner == who.euid || who.ownsAll;
}

}  // namespace vexo
