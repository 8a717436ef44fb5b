#include "filesystem/owner.h"

#include <fcntl.h>
#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <cerrno>
#include <string>

namespace vexo {
namespace {

constexpr unsigned kSmb1Magic = 0xFF534D42;  // the CIFS client, by its older number

bool keepsOwners(int fd) {
    struct statfs fileSystem;
    if (fstatfs(fd, &fileSystem) != 0) return true;
    switch (static_cast<unsigned>(fileSystem.f_type)) {
        case MSDOS_SUPER_MAGIC:
        case EXFAT_SUPER_MAGIC:
        case FUSE_SUPER_MAGIC:
        case SMB_SUPER_MAGIC:
        case SMB2_SUPER_MAGIC:
        case kSmb1Magic:
            return false;
        default:
            return true;
    }
}

bool forgiven(int fd, int result) {
    if (result == 0) return true;
    const int failure = errno;
    if ((failure == EPERM || failure == EOPNOTSUPP || failure == ENOSYS) && !keepsOwners(fd)) return true;
    errno = failure;
    return false;
}

}  // namespace

bool setOwner(int fd, uid_t uid, gid_t gid) {
    if (uid == static_cast<uid_t>(-1) && gid == static_cast<gid_t>(-1)) return true;
    return forgiven(fd, fchownat(fd, "", uid, gid, AT_EMPTY_PATH));
}

bool setMode(int fd, mode_t mode) {
    const int done = fchmod(fd, mode);
    // Open for its path only.
    const bool again = done != 0 && errno == EBADF;
    return forgiven(fd, again ? chmod(("/proc/self/fd/" + std::to_string(fd)).c_str(), mode) : done);
}

}  // namespace vexo
