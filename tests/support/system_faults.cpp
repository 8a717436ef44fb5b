#include "support/system_faults.h"

#include <dirent.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

namespace support {
namespace {

struct Order {
    std::string path;
    int error = 0;
    int nth = 0;
};

Order reading, status;

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

}  // namespace support

extern "C" {
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
