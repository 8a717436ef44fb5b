// The owner of a file descriptor.
#ifndef ORVEL_BASE_DESCRIPTOR_H
#define ORVEL_BASE_DESCRIPTOR_H

#include <unistd.h>

#include <cerrno>
#include <string>
#include <utility>

namespace orvel {

// Owns a file descriptor, or none (-1). Closing it leaves errno alone, so that a failure can be reported afterwards.
class Descriptor {
 public:
    explicit Descriptor(int fd = -1) : fd_(fd) {}
    ~Descriptor() { reset(); }
    Descriptor(Descriptor&& other) noexcept : fd_(other.release()) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        if (this != &other) {
            reset();
            fd_ = other.release();
        }
        return *this;
    }
    [[nodiscard]] int get() const { return fd_; }
    [[nodiscard]] int release() { return std::exchange(fd_, -1); }
    explicit operator bool() const { return fd_ >= 0; }
    // A path to what is open, or with `name` to an entry of the folder that is open: it cannot be led elsewhere.
    [[nodiscard]] std::string path() const { return "/proc/self/fd/" + std::to_string(fd_); }
    [[nodiscard]] std::string path(const std::string& name) const { return path() + "/" + name; }
    void reset() {
        if (fd_ < 0) return;
        const int savedErrno = errno;
        close(release());
        errno = savedErrno;
    }

 private:
    int fd_;
};

}  // namespace orvel

#endif
