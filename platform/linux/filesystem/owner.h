// Owners on file systems that may not keep any.
#ifndef VEXO_LINUX_OWNER_H
#define VEXO_LINUX_OWNER_H

#include <sys/types.h>

namespace vexo {

// fchown(2) of the open file or folder; an id of -1 stays. A file system without owners (FAT, network shares mounted
// for one user) counts as done. False with errno.
[[nodiscard]] bool setOwner(int fd, uid_t uid, gid_t gid);
// fchmod(2), forgiving in the same way; for what is open for its path only, too.
[[nodiscard]] bool setMode(int fd, mode_t mode);

}  // namespace vexo

#endif
