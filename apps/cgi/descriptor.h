// An open file, closed with its owner.
#ifndef ORVEL_CGI_DESCRIPTOR_H
#define ORVEL_CGI_DESCRIPTOR_H

#include <unistd.h>

#include <string>
#include <utility>

namespace orvel::cgi {

class Descriptor {
 public:
    explicit Descriptor(int fd = -1) : fd_(fd) {}
    ~Descriptor() { reset(); }
    Descriptor(Descriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        if (this != &other) {
            reset();
            fd_ = std::exchange(other.fd_, -1);
        }
        return *this;
    }
    [[nodiscard]] int get() const { return fd_; }
    explicit operator bool() const { return fd_ >= 0; }
    // A path to what is open, or with `name` to an entry of the folder that is open: it cannot be led elsewhere.
    [[nodiscard]] std::string path() const { return "/proc/self/fd/" + std::to_string(fd_); }
    [[nodiscard]] std::string path(const std::string& name) const { return path() + "/" + name; }

 private:
    void reset() {
        if (fd_ >= 0) close(fd_);
        fd_ = -1;
    }
    int fd_;
};

}  // namespace orvel::cgi

#endif
