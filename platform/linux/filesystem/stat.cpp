#include "vexo/stat.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <algorithm>
#include <cerrno>

#include "failure.h"
#include "fault_gate.h"
#include "filesystem/status.h"

namespace {

uint32_t attributesOf(const struct statx& from) {
    constexpr uint64_t needed = STATX_ATTR_IMMUTABLE | STATX_ATTR_APPEND | STATX_ATTR_MOUNT_ROOT;
    uint32_t attributes = 0;
    if ((from.stx_attributes_mask & needed) == needed && (from.stx_attributes & STATX_ATTR_MOUNT_ROOT) == 0) {
        attributes |= VEXO_ATTRIBUTE_KNOWN;
    }
    if ((from.stx_attributes & STATX_ATTR_IMMUTABLE) != 0) attributes |= VEXO_ATTRIBUTE_IMMUTABLE;
    if ((from.stx_attributes & STATX_ATTR_APPEND) != 0) attributes |= VEXO_ATTRIBUTE_APPEND;
    return attributes;
}

_tag_VEXOSTAT_ recordOf(const struct statx& from, bool withCreateTime) {
    _tag_VEXOSTAT_ record{};
    record.st_mode = from.stx_mode;
    record.st_uid = from.stx_uid;
    record.st_gid = from.stx_gid;
    record.st_size = static_cast<int64_t>(from.stx_size);
    record.st_access = from.stx_atime.tv_sec;
    record.st_modify = from.stx_mtime.tv_sec;
    record.st_change = from.stx_ctime.tv_sec;
    if (withCreateTime) {
        const bool kept = (from.stx_mask & STATX_BTIME) != 0;
        record.st_create = kept ? from.stx_btime.tv_sec : std::min(record.st_modify, record.st_change);
    }
    record.st_device = makedev(from.stx_dev_major, from.stx_dev_minor);
    record.st_inode = from.stx_ino;
    record.st_links = from.stx_nlink;
    record.st_attributes = attributesOf(from);
    return record;
}

}  // namespace

namespace vexo {

bool readStatus(int dirfd, const char* path, int atFlags, bool withCreateTime, _tag_VEXOSTAT_& status) {
    const unsigned mask = STATX_BASIC_STATS | (withCreateTime ? STATX_BTIME : 0U);
    struct statx kernel;  // filled whole by the call: clearing 256 bytes an entry would show in a listing
    if (statx(dirfd, path, atFlags | AT_NO_AUTOMOUNT, mask, &kernel) != 0) return false;
    status = recordOf(kernel, withCreateTime);
    return true;
}

}  // namespace vexo

namespace {

int errorOfStatus(int systemCode) {
    switch (systemCode) {
        case ENOENT:
        case ENOTDIR:
            return VEXO_ERR_MISSING;
        case EACCES:
        case EPERM:
            return VEXO_ERR_DENIED;
        default:
            return VEXO_ERR_GENERAL;
    }
}

int statusOf(int dirfd, const char* path, unsigned flags, _tag_VEXOSTAT_* status) {
    if (status == nullptr) return vexo::fail(VEXO_ERR_GENERAL, EINVAL);
    *status = {};
    if (path == nullptr) return vexo::fail(VEXO_ERR_GENERAL, EINVAL);
    const bool withCreateTime = (flags & VEXO_STAT_CREATE_TIME) != 0;
    if (vexo::readStatus(dirfd, path, AT_SYMLINK_NOFOLLOW, withCreateTime, *status)) return 0;
    return vexo::fail(errorOfStatus(errno));
}

}  // namespace

int VLIBCFileLStat(const char* path, unsigned flags, _tag_VEXOSTAT_* status) {
    VEXO_GATE("VLIBCFileLStat", -1);
    return statusOf(AT_FDCWD, path, flags, status);
}

int VLIBCFileLStatAt(int dirfd, const char* name, unsigned flags, _tag_VEXOSTAT_* status) {
    VEXO_GATE("VLIBCFileLStatAt", -1);
    return statusOf(dirfd, name, flags, status);
}
