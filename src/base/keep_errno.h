// errno, kept over what does not matter.
#ifndef ORVEL_BASE_KEEP_ERRNO_H
#define ORVEL_BASE_KEEP_ERRNO_H

#include <cerrno>

namespace orvel {

// Preserves errno across calls whose failure does not matter.
class KeepErrno {
 public:
    KeepErrno() : saved_(errno) {}
    ~KeepErrno() { errno = saved_; }
    KeepErrno(const KeepErrno&) = delete;
    KeepErrno& operator=(const KeepErrno&) = delete;

 private:
    int saved_;
};

}  // namespace orvel

#endif
