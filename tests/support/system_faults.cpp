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

std::string folderOf(int fd) {
    std::error_code ignored;
    return std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(fd), ignored);
}

bool refusesOnce(FaultOrder& order, const std::string& path) {
    if (order.path != path || --order.count != 0) return false;
    errno = order.error;
    return true;
}

}  // namespace

SystemFault::SystemFault(FaultOrder& order, const std::string& path, int error, int count) : order_(order) {
    order_ = {path, error, count};
}

SystemFault::~SystemFault() {
    order_ = {};
}

}  // namespace support

extern "C" {
int openat(int folder, const char* name, int flags, ...) {
    using support::failingOpening;
    if (failingOpening.count > 0 && failingOpening.path == name) {
        --failingOpening.count;
        errno = failingOpening.error;
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
    if (!failingReading.path.empty() && refusesOnce(failingReading, folderOf(fd))) return -1;
    return syscall(SYS_getdents64, fd, buffer, size);
}

int fstatat(int fd, const char* name, struct stat* out, int flags) noexcept {
    using namespace support;
    if (!failingStatus.path.empty() && refusesOnce(failingStatus, folderOf(fd) + "/" + name)) return -1;
    return static_cast<int>(syscall(SYS_newfstatat, fd, name, out, flags));
}
}
