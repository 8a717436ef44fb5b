#include "filesystem/file_permissions.h"

#include <endian.h>
#include <fcntl.h>
#include <linux/limits.h>
#include <linux/posix_acl.h>
#include <linux/posix_acl_xattr.h>
#include <sys/xattr.h>

#include <cstring>
#include <string>
#include <vector>

#include "filesystem/owner.h"
#include "io/file_io.h"

namespace vexo {
namespace {

constexpr const char* kAcl = "system.posix_acl_access";
constexpr const char* kDefaultAcl = "system.posix_acl_default";

// Attributes of what is open for its path only are read by this name.
std::string pathOf(int fd) {
    return "/proc/self/fd/" + std::to_string(fd);
}

}  // namespace

bool takeOverPermissions(int folder, const char* name, mode_t mode, int file) {
    const Descriptor old = openFile(folder, name, O_PATH | O_NOFOLLOW);
    std::vector<char> acl(XATTR_SIZE_MAX);
    const ssize_t size = old ? getxattr(pathOf(old.get()).c_str(), kAcl, acl.data(), acl.size()) : -1;
    if (size > 0) return fsetxattr(file, kAcl, acl.data(), static_cast<size_t>(size), 0) == 0;
    return setMode(file, mode & 0777);
}

bool hasDefaultAcl(int folder) {
    return getxattr(pathOf(folder).c_str(), kDefaultAcl, nullptr, 0) > 0;
}

std::optional<mode_t> defaultAclMode(int folder) {
    alignas(posix_acl_xattr_header) char value[XATTR_SIZE_MAX];
    const ssize_t size = getxattr(pathOf(folder).c_str(), kDefaultAcl, value, sizeof value);
    if (size <= 0) return std::nullopt;
    mode_t owner = 0, group = 0, others = 0;
    bool masked = false;
    for (size_t at = sizeof(posix_acl_xattr_header); at + sizeof(posix_acl_xattr_entry) <= static_cast<size_t>(size);
         at += sizeof(posix_acl_xattr_entry)) {
        posix_acl_xattr_entry entry;
        memcpy(&entry, value + at, sizeof entry);
        const mode_t bits = le16toh(entry.e_perm) & 7U;
        const unsigned tag = le16toh(entry.e_tag);
        if (tag == ACL_USER_OBJ) owner = bits;
        if (tag == ACL_OTHER) others = bits;
        if (tag == ACL_MASK || (tag == ACL_GROUP_OBJ && !masked)) group = bits;
        masked = masked || tag == ACL_MASK;
    }
    return owner << 6 | group << 3 | others;
}

}  // namespace vexo
