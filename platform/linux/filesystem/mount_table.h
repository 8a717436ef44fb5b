// The mount table of the appliance, parsed.
#ifndef VEXO_LINUX_MOUNT_TABLE_H
#define VEXO_LINUX_MOUNT_TABLE_H

#include <string>
#include <string_view>
#include <vector>

namespace vexo {

struct Mount {
    std::string folder;    // mount point, decoded, without a trailing slash except for "/"
    std::string typeName;  // as the kernel names it
    int type;              // position in rgszFsType, else VEXO_FS_UNKNOWN
};
using MountTable = std::vector<Mount>;  // in the order of the table: what was mounted later comes later

// Parses the text of a mount table: fields device, folder, type..., with \ooo for blanks; lines with fewer fields and
// comments are left out.
[[nodiscard]] MountTable parseMountTable(std::string_view text);

// The table of the system root where it has one, else the machine's: read once, and again when it changed. Null with
// errno and the slot (0x0900) when it cannot be read. Valid until the next call.
[[nodiscard]] const MountTable* mountTable();

// The mount whose folder is exactly `path` (repeated and trailing slashes do not count; later mounts win); null
// without.
[[nodiscard]] const Mount* mountAt(const MountTable& table, std::string_view path);
// The mount that holds the absolute `path`: the longest folder that is a prefix of it; null without.
[[nodiscard]] const Mount* mountHolding(const MountTable& table, std::string_view path);

}  // namespace vexo

#endif
