#include "orvel/mount_status.h"

#include <mntent.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <iterator>
#include <memory>

#include "core/boundary.h"
#include "core/owned.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace {

constexpr const char* kSource = "orvelenum";

using MountTable = std::unique_ptr<FILE, orvel::Releaser<endmntent>>;

// A system root that is not the machine's own may bring a mount table along.
MountTable openMountTable() {
    const std::string ofRoot = VEXO::SystemPath("/proc/mounts");
    return MountTable(setmntent(access(ofRoot.c_str(), F_OK) == 0 ? ofRoot.c_str() : "/proc/mounts", "r"));
}

int typeNumber(const char* typeName) {
    for (int type = 0; type < static_cast<int>(std::size(rgszFsType)); ++type) {
        if (strcmp(rgszFsType[type], typeName) == 0) return type;
    }
    return VEXO_FS_UNKNOWN;
}

bool holds(const std::string& folder, const char* path) {
    if (strncmp(folder.c_str(), path, folder.size()) != 0) return false;
    const char next = path[folder.size()];
    return next == '\0' || next == '/';
}

}  // namespace

OrvelMountStatus::OrvelMountStatus() = default;
OrvelMountStatus::~OrvelMountStatus() = default;

bool OrvelMountStatus::GetMountStatus() {
    return orvel::guardedQuietly(false, [&] {
        const MountTable table = openMountTable();
        if (!table) {
            VLIBCErrSetEx(VEXO_ERR_FILE, kSource, __LINE__);
            return false;
        }
        while (const mntent* entry = getmntent(table.get())) {
            const bool readOnly = hasmntopt(entry, "ro") != nullptr;
            // Of several mounts on one folder the first line stays, though the last one covers it: kept.
            mounts_.insert({entry->mnt_dir, MOUNT_STATUS{typeNumber(entry->mnt_type), readOnly}});
        }
        return true;
    });
}

int OrvelMountStatus::getFSTYPE(const char* path) {
    return orvel::guardedQuietly(int{VEXO_FS_UNKNOWN}, [&]() -> int {
        std::string folder = path == nullptr ? "" : path;
        folder.erase(folder.find_last_not_of('/') + 1);  // "/" becomes "", which is no mount point
        if (!loaded_ && !GetMountStatus()) return VEXO_FS_UNKNOWN;
        const auto found = mounts_.find(folder);
        loaded_ = true;
        return found == mounts_.end() ? int{VEXO_FS_NOT_A_MOUNT} : found->second.fsType;
    });
}

bool OrvelMountStatus::IsReadOnly(const char* path) {
    return orvel::guardedQuietly(false, [&] {
        if (path == nullptr) return false;
        if (!loaded_ && !GetMountStatus()) return false;
        bool readOnly = false;
        // In byte order a mount point comes before those below it, so the last match is the deepest.
        for (const auto& [folder, status] : mounts_) {
            if (holds(folder, path)) readOnly = status.readOnly;
        }
        return readOnly;
    });
}
