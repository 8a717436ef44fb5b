#include "filesystem/file_permissions.h"

#include <fcntl.h>
#include <linux/limits.h>
#include <sys/xattr.h>

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

}  // namespace vexo
