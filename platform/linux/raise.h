// The identity with which the platform reaches its central stores.
#ifndef VEXO_LINUX_RAISE_H
#define VEXO_LINUX_RAISE_H

#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace vexo {

// Raises the effective ids to root for its own lifetime, in a process that switched to a user and kept the saved uid 0;
// elsewhere it does nothing. One for each operation on a central store, never around anything that touches users'
// files. errno passes through both ends.
class RaisedIdentity {
 public:
    RaisedIdentity() {
        const int savedErrno = errno;
        uid_t real = 0;
        uid_t saved = 0;
        if (getresuid(&real, &uid_, &saved) == 0 && uid_ != 0 && saved == 0 && seteuid(0) == 0) {
            raised_ = true;
            gid_ = getegid();
            if (setegid(0) != 0) abort();
        }
        errno = savedErrno;
    }
    ~RaisedIdentity() {
        if (!raised_) return;
        const int savedErrno = errno;
        // To go on as root with a user's request would be worse than to stop.
        if (setegid(gid_) != 0 || seteuid(uid_) != 0) abort();
        errno = savedErrno;
    }
    RaisedIdentity(const RaisedIdentity&) = delete;
    RaisedIdentity& operator=(const RaisedIdentity&) = delete;

 private:
    bool raised_ = false;
    uid_t uid_ = 0;
    gid_t gid_ = 0;
};

}  // namespace vexo

#endif
