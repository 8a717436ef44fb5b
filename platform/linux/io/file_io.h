// Files as the platform reads them: which version was read, and which may be trusted. Functions that return bool leave
// errno on failure.
#ifndef VEXO_LINUX_FILE_IO_H
#define VEXO_LINUX_FILE_IO_H

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>

#include "base/file.h"

namespace vexo {

using orvel::Descriptor;
using orvel::isSameFile;
using orvel::lockFile;
using orvel::openFile;
using orvel::readAll;
using orvel::writeAll;

// When something was found unchanged: while it is recent nobody needs to look again. Never in a process that does not
// serve a request.
class RecentLook {
 public:
    [[nodiscard]] bool isRecent() const;
    void note();
    // From here on no look is recent; of a request that begins, or where this process has changed something.
    static void forgetAll();
    static void beginRequest();

 private:
    unsigned generation_ = 0;
    std::int64_t time_ = 0;
};

// Which version of a file was read, for whoever remembers what it held.
class FileVersion {
 public:
    FileVersion() = default;  // of no file
    // `status` as fstat gives it, made before the file is read.
    explicit FileVersion(const struct stat& status);
    // True when `status`, taken later, still shows the version that was read.
    [[nodiscard]] bool isCurrent(const struct stat& status) const;
    // The same of the file at `path` as it is now, or was at a recent look.
    [[nodiscard]] bool isCurrentAt(const std::string& path) const;
    // For readers: a later write within the same clock tick may go unnoticed.
    [[nodiscard]] bool isSame(const struct stat& status) const;

 private:
    dev_t device_ = 0;
    ino_t inode_ = 0;
    off_t size_ = 0;
    timespec modified_{};
    bool settled_ = false;  // no later write can leave the same time
    mutable RecentLook look_;
};

// Reads a regular file (anything else: EINVAL, without waiting on a pipe) into `text`; `version` is what was read.
[[nodiscard]] bool readRegularFile(const std::string& path, size_t limit, std::string& text, FileVersion& version);

// True for what a central store may trust: of this type (S_IFREG, S_IFDIR), owned by root or the effective user,
// writable by nobody else, and, for a file, under one name only.
[[nodiscard]] bool isTrusted(const struct stat& status, mode_t type);

}  // namespace vexo

#endif
