#include "tree.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace orvel::demo {
namespace {

[[noreturn]] void fail(const std::string& what) {
    throw std::system_error(errno, std::generic_category(), what);
}

class NewFile {
 public:
    NewFile(int folder, const std::string& path, mode_t mode)
        : fd_(openat(folder, path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, mode)) {
        if (fd_ < 0) fail(path);
    }
    ~NewFile() { close(fd_); }
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;
    [[nodiscard]] int fd() const { return fd_; }

 private:
    int fd_;
};

}  // namespace

Tree::Tree(const std::string& root, const Identities& ids) : root_(root), ids_(ids), owner_(ids.alice), fd_(-1) {
    if (mkdir(root.c_str(), 0700) != 0) fail(root);
    fd_ = open(root.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (fd_ < 0) fail(root);
}

Tree::~Tree() {
    if (fd_ >= 0) close(fd_);
}

void Tree::folder(const std::string& path, mode_t mode) {
    if (mkdirat(fd_, path.c_str(), mode) != 0) fail(path);
    own(path);
}

void Tree::file(const std::string& path, int64_t size, time_t modified, mode_t mode) {
    const NewFile file(fd_, path, mode);
    const timespec times[2] = {{modified, 0}, {modified, 0}};
    if (ftruncate(file.fd(), size) != 0 || futimens(file.fd(), times) != 0) fail(path);
    own(path);
}

void Tree::textFile(const std::string& path, const std::string& text) {
    const NewFile file(fd_, path, 0664);
    if (write(file.fd(), text.data(), text.size()) != static_cast<ssize_t>(text.size())) fail(path);
    own(path);
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

}  // namespace orvel::demo
