#include "io/append_line.h"

#include <unistd.h>

#include <cerrno>

namespace vexo {
namespace {

// Whether the file ends within a line; false with errno when that cannot be determined.
bool endsWithinLine(int fd, off_t size, bool& within) {
    char last = '\n';
    if (size > 0 && pread(fd, &last, 1, size - 1) != 1) return false;
    within = last != '\n';
    return true;
}

}  // namespace

bool appendLine(int fd, std::string line) {
    bool within = false;
    const off_t end = lseek(fd, 0, SEEK_END);
    if (end < 0 || !endsWithinLine(fd, end, within)) return false;
    if (within) line.insert(line.begin(), '\n');
    ssize_t written = 0;
    do {
        written = write(fd, line.data(), line.size());
    } while (written < 0 && errno == EINTR);
    if (written == static_cast<ssize_t>(line.size())) return true;
    const int failure = written < 0 ? errno : ENOSPC;
    if (written > 0 && ftruncate(fd, end) != 0) return false;
    errno = failure;
    return false;
}

}  // namespace vexo
