#include "demo/tree.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace orvel::ctl::appliance {
namespace {

[[noreturn]] void fail(const std::string& what) {
    throw std::system_error(errno, std::generic_category(), what);
}

// No time of its own: now.
constexpr time_t kNow = 0;

}  // namespace

Tree::Tree(const std::string& root, const Identities& ids) : root_(root), ids_(ids), owner_(ids.alice), fd_(-1) {
    if (mkdir(root.c_str(), 0700) != 0) fail(root);
    fd_ = open(root.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (fd_ < 0) fail(root);
}

Tree::~Tree() {
    if (fd_ >= 0) ::close(fd_);
}

void Tree::folder(const std::string& path, mode_t mode) {
    if (mkdirat(fd_, path.c_str(), 0700) != 0) fail(path);
    if (fchmodat(fd_, path.c_str(), mode, 0) != 0) fail(path);
    own(path);
}

void Tree::file(const std::string& path, int64_t size, time_t modified, mode_t mode) {
    const int fd = openat(fd_, path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    if (fd < 0 || ftruncate(fd, size) != 0) fail(path);
    close(fd, path, modified, mode);
}

void Tree::textFile(const std::string& path, const std::string& text) {
    const int fd = openat(fd_, path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    if (fd < 0 || write(fd, text.data(), text.size()) != static_cast<ssize_t>(text.size())) fail(path);
    close(fd, path, kNow, 0664);
}

void Tree::link(const std::string& path, const std::string& target) {
    if (symlinkat(target.c_str(), fd_, path.c_str()) != 0) fail(path);
    own(path);
}

void Tree::finish(uid_t uid, mode_t mode) {
    if (ids_.real && fchown(fd_, uid, ids_.users) != 0) fail(root_);
    if (fchmod(fd_, mode) != 0) fail(root_);
}

void Tree::own(const std::string& path) const {
    if (!ids_.real) return;
    if (fchownat(fd_, path.c_str(), owner_, ids_.users, AT_SYMLINK_NOFOLLOW) != 0) fail(path);
}

void Tree::close(int fd, const std::string& path, time_t modified, mode_t mode) const {
    const timespec times[2] = {{modified, 0}, {modified, 0}};
    if (fchmod(fd, mode) != 0 || (modified != kNow && futimens(fd, times) != 0)) fail(path);
    ::close(fd);
    own(path);
}

}  // namespace orvel::ctl::appliance
