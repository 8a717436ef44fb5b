// Permissions of files that take a place in a share.
#ifndef VEXO_LINUX_FILE_PERMISSIONS_H
#define VEXO_LINUX_FILE_PERMISSIONS_H

#include <sys/stat.h>
#include <sys/types.h>

#include <optional>

namespace vexo {

// The umask for as long as files are created: the process's own may be 0, left so by the making of temporary folders. A
// folder's default ACL takes its place.
class Umask {
 public:
    explicit Umask(mode_t mask) : saved_(umask(mask)) {}
    ~Umask() { umask(saved_); }
    Umask(const Umask&) = delete;
    Umask& operator=(const Umask&) = delete;

 private:
    mode_t saved_;
};

// Gives the open `file` the permissions of the file `name`, whose mode is `mode`, in `folder`. Its ACL goes along with
// the mode: with it, the group bits are a mask, and alone they could grant the group what the ACL withheld. False with
// errno.
[[nodiscard]] bool takeOverPermissions(int folder, const char* name, mode_t mode, int file);

// Whether a default ACL decides about new files in `folder`, which may be open for its path only.
[[nodiscard]] bool hasDefaultAcl(int folder);
// The most that the default ACL of `folder` grants to the owner, the group (its mask, where it has one) and others;
// nothing where there is none.
[[nodiscard]] std::optional<mode_t> defaultAclMode(int folder);

}  // namespace vexo

#endif
