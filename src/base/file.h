// Calls on open files that are begun again when a signal interrupts them. Those that return bool leave errno on
// failure.
#ifndef ORVEL_BASE_FILE_H
#define ORVEL_BASE_FILE_H

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "base/descriptor.h"

namespace orvel {

// openat, close-on-exec. Empty with errno on failure.
[[nodiscard]] Descriptor openFile(int folder, const char* path, int flags, mode_t mode = 0);
[[nodiscard]] inline Descriptor openFile(const std::string& path, int flags, mode_t mode = 0) {
    return openFile(AT_FDCWD, path.c_str(), flags, mode);
}

// flock; `how` is LOCK_EX or LOCK_SH, with LOCK_NB not to wait (then EWOULDBLOCK when somebody else has it).
[[nodiscard]] bool lockFile(int fd, int how);

// Appends what is left of `fd` to `out`; EFBIG when that is more than `limit` bytes.
[[nodiscard]] bool readAll(int fd, std::string& out, std::size_t limit);
[[nodiscard]] bool writeAll(int fd, std::string_view text);

// Whether both describe one file; of files that are open or were looked at now, since numbers are given out again.
[[nodiscard]] inline bool isSameFile(const struct stat& a, const struct stat& b) {
    return a.st_dev == b.st_dev && a.st_ino == b.st_ino;
}

}  // namespace orvel

#endif
