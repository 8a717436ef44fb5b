// Reading of a folder's entries straight from the kernel, in the order in which the file system delivers them.
#ifndef ORVEL_ENUM_FOLDER_READER_H
#define ORVEL_ENUM_FOLDER_READER_H

#include <dirent.h>

#include <cerrno>
#include <cstddef>
#include <memory>

namespace orvel {

// One reader serves many folders, so a walk allocates its buffer once.
class FolderReader {
 public:
    FolderReader() : buffer_(new std::byte[kBufferSize]) {}

    // Calls visit(name, type) for each entry from the position of `fd` on, "." and ".." included; `type` is a DT_
    // value, `name` holds during the call. A visit that returns false stops the reading. 0, or the error number that
    // ended the reading early.
    template <class Visit>
    [[nodiscard]] int forEach(int fd, Visit&& visit) {
        for (;;) {
            const ssize_t bytes = getdents64(fd, buffer_.get(), kBufferSize);
            if (bytes < 0 && errno == EINTR) continue;
            if (bytes < 0) return errno == ENOENT ? 0 : errno;  // ENOENT: removed meanwhile, hence without entries
            if (bytes == 0) return 0;
            for (ssize_t at = 0; at < bytes;) {
                const auto* entry = reinterpret_cast<const dirent64*>(buffer_.get() + at);
                if (!visit(static_cast<const char*>(entry->d_name), entry->d_type)) return 0;
                at += entry->d_reclen;
            }
        }
    }

 private:
    static constexpr std::size_t kBufferSize = 64 * 1024;  // aligned as new aligns, which suits dirent64
    std::unique_ptr<std::byte[]> buffer_;
};

}  // namespace orvel

#endif
