#include "support/system_faults.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <filesystem>

namespace support {
namespace {

struct Order {
    std::string path;
    int error = 0;
    int nth = 0;
};

Order reading, status, opening;

std::string folderOf(int fd) {
    std::error_code ignored;
    return std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(fd), ignored);
}

bool refuses(Order& order, const std::string& path) {
    if (order.path != path || --order.nth != 0) return false;
    errno = order.error;
    return true;
}

}  // namespace

ReadingFault::ReadingFault(const std::string& path, int error, int nth) {
    reading = {path, error, nth};
}

ReadingFault::~ReadingFault() {
    reading = {};
}

StatusFault::StatusFault(const std::string& path, int error) {
    status = {path, error, 1};
}

StatusFault::~StatusFault() {
    status = {};
}

OpeningFault::OpeningFault(const std::string& path, int error, int times) {
    opening = {path, error, times};
}

OpeningFault::~OpeningFault() {
    opening = {};
}

}  // namespace support

extern "C" {
int openat(int folder, const char* name, int flags, ...) {
    using namespace support;
    if (opening.nth > 0 && opening.path == name) {
        --opening.nth;
        errno = opening.error;
        return -1;
    }
    va_list rest;
    va_start(rest, flags);
    const mode_t mode = (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(rest, mode_t) : 0;
    va_end(rest);
    return static_cast<int>(syscall(SYS_openat, folder, name, flags, mode));
}

ssize_t getdents64(int fd, void* buffer, size_t size) {
    using namespace support;
    if (!reading.path.empty() && refuses(reading, folderOf(fd))) return -1;
    return syscall(SYS_getdents64, fd, buffer, size);
}

int fstatat(int fd, const char* name, struct stat* out, int flags) noexcept {
    using namespace support;
    if (!status.path.empty() && refuses(status, folderOf(fd) + "/" + name)) return -1;
    return static_cast<int>(syscall(SYS_newfstatat, fd, name, out, flags));
}
}
