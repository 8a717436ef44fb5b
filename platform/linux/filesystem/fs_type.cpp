// File-system types by number, and what the mount table says about a path.
#include <algorithm>
#include <cerrno>
#include <exception>
#include <string>

#include "failure.h"
#include "fault_gate.h"
#include "filesystem/mount_table.h"
#include "vexo/filesystem.h"

const char rgszFsType[9][10] = {"ext4", "vfat", "btrfs", "xfs", "iso9660", "udf", "cifs", "nfs", "nfs4"};

namespace {

// Type of the mount that the last VEXOFSIsInMountTable found.
int lastFoundType = VEXO_FS_NOT_A_MOUNT;

}  // namespace

int VEXOGetFSType(const char* path, int /*flags*/) try {
    VEXO_GATE("VEXOGetFSType", -1);
    if (path == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const vexo::MountTable* table = vexo::mountTable();
    if (table == nullptr) return -1;
    const vexo::Mount* mount = vexo::mountHolding(*table, path);
    return mount == nullptr ? int{VEXO_FS_UNKNOWN} : mount->type;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOFSIsInMountTable(const char* path) try {
    lastFoundType = VEXO_FS_NOT_A_MOUNT;
    VEXO_GATE("VEXOFSIsInMountTable", -1);
    if (path == nullptr || *path == '\0') return -1;
    const vexo::KeepErrno keep;
    const vexo::MountTable* table = vexo::mountTable();
    if (table == nullptr) return -1;
    const vexo::Mount* mount = vexo::mountAt(*table, path);
    if (mount == nullptr) return -1;
    lastFoundType = mount->type;
    return static_cast<int>(mount - table->data());
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL);
}

int VEXOFSHasRemoteBelow(const char* path) try {
    VEXO_GATE("VEXOFSHasRemoteBelow", 0);
    if (path == nullptr || *path != '/') return 0;
    const vexo::KeepErrno keep;
    const vexo::MountTable* table = vexo::mountTable();
    if (table == nullptr) return 0;
    std::string below = path;
    while (below.ends_with('/')) below.pop_back();
    below += '/';
    return std::any_of(table->begin(), table->end(), [&](const vexo::Mount& mount) {
        return VEXOFSIsRemoteFS(mount.type) == 1 && mount.folder.starts_with(below);
    });
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}

int VEXOFSIsRemoteFS() {
    return VEXOFSIsRemoteFS(lastFoundType);
}

int VEXOFSIsRemoteFS(int type) {
    return type >= 6 && type <= 8 ? 1 : 0;
}

int VEXOFSIsImageFS(int type) {
    return type == 4 || type == 5 ? 1 : 0;
}
