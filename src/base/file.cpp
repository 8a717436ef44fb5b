#include "base/file.h"

#include <unistd.h>

#include <cerrno>

namespace orvel {

Descriptor openFile(int folder, const char* path, int flags, mode_t mode) {
    int fd = -1;
    do {
        fd = openat(folder, path, flags | O_CLOEXEC, mode);
    } while (fd < 0 && errno == EINTR);
    return Descriptor(fd);
}

bool lockFile(int fd, int how) {
    int result = 0;
    do {
        result = flock(fd, how);
    } while (result != 0 && errno == EINTR);
    return result == 0;
}

bool readAll(int fd, std::string& out, std::size_t limit) {
    char buffer[65536];
    std::size_t total = 0;
    while (true) {
        const ssize_t got = read(fd, buffer, sizeof buffer);
        if (got == 0) return true;
        if (got < 0) {
            if (errno == EINTR) continue;
            return false;
        }
        total += static_cast<std::size_t>(got);
        if (total > limit) {
            errno = EFBIG;
            return false;
        }
        out.append(buffer, static_cast<std::size_t>(got));
    }
}

bool writeAll(int fd, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = write(fd, text.data(), text.size());
        if (written > 0) {
            text.remove_prefix(static_cast<std::size_t>(written));
        } else if (written == 0) {
            errno = ENOSPC;
            return false;
        } else if (errno != EINTR) {
            return false;
        }
    }
    return true;
}

}  // namespace orvel
