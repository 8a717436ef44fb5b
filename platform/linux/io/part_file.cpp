#include "io/part_file.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <sys/random.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>

#include "failure.h"

namespace vexo {
namespace {

constexpr int kAttempts = 100;

// "" with errno when the kernel gives no random bytes.
std::string drawName() {
    unsigned long long number = 0;
    if (getrandom(&number, sizeof number, 0) != static_cast<ssize_t>(sizeof number)) return "";
    std::array<char, 40> name;
    snprintf(name.data(), name.size(), ".part-%016llx", number);
    return name.data();
}

}  // namespace

bool PartFile::create(mode_t mode) {
    fd_ = openFile(folder_, ".", O_TMPFILE | O_RDWR, mode);
    if (fd_) return true;
    // What file systems answer that know no nameless files, and kernels that take the flag for O_DIRECTORY.
    if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) return false;
    return createNamed(mode);
}

bool PartFile::adopt(int fd) {
    fd_ = Descriptor(fcntl(fd, F_DUPFD_CLOEXEC, 0));
    return static_cast<bool>(fd_);
}

bool PartFile::createNamed(mode_t mode) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        std::string name = drawName();
        if (name.empty()) return false;
        fd_ = openFile(folder_, name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW, mode);
        if (fd_) name_ = std::move(name);
        if (fd_ || errno != EEXIST) return static_cast<bool>(fd_);
    }
    return false;
}

bool PartFile::publish(const char* name, bool replace) {
    if (!replace) return name_.empty() ? linkNameless(name) : moveToFreeName(name);
    for (int attempt = 0; name_.empty() && attempt < kAttempts; ++attempt) {
        std::string drawn = drawName();
        if (drawn.empty()) return false;
        if (linkNameless(drawn.c_str())) {
            name_ = std::move(drawn);
        } else if (errno != EEXIST) {
            return false;
        }
    }
    if (renameat(folder_, name_.c_str(), folder_, name) != 0) return false;
    name_.clear();
    return true;
}

bool PartFile::linkNameless(const char* name) {
    const std::string self = "/proc/self/fd/" + std::to_string(fd_.get());
    return linkat(AT_FDCWD, self.c_str(), folder_, name, AT_SYMLINK_FOLLOW) == 0;
}

bool PartFile::moveToFreeName(const char* name) {
    if (renameat2(folder_, name_.c_str(), folder_, name, RENAME_NOREPLACE) != 0) {
        if (errno != EINVAL && errno != ENOSYS) return false;
        // No such rename here: the name is taken by an empty file of our own, and that one is then replaced.
        const Descriptor claim = openFile(folder_, name, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
        if (!claim) return false;
        if (renameat(folder_, name_.c_str(), folder_, name) != 0) {
            const KeepErrno keep;
            unlinkat(folder_, name, 0);
            return false;
        }
    }
    name_.clear();
    return true;
}

void PartFile::removeName() {
    const KeepErrno keep;
    if (!name_.empty()) unlinkat(folder_, name_.c_str(), 0);
    name_.clear();
}

}  // namespace vexo
