// Root for a moment, in a process that works as a user.
#ifndef ORVEL_BASE_RAISED_IDENTITY_H
#define ORVEL_BASE_RAISED_IDENTITY_H

#include <unistd.h>

#include <cerrno>
#include <cstdlib>

namespace orvel {

// Raises the effective ids to root for its own lifetime, in a process that switched to a user and kept uid 0 as its
// real or saved uid; elsewhere it does nothing. One for each operation on what belongs to the system, never around
// anything that touches users' files. errno passes through both ends.
class RaisedIdentity {
 public:
    RaisedIdentity() {
        const int savedErrno = errno;
        uid_t real = 0;
        uid_t saved = 0;
        if (getresuid(&real, &uid_, &saved) == 0 && uid_ != 0 && (real == 0 || saved == 0) && seteuid(0) == 0) {
            raised_ = true;
            gid_ = getegid();
            // Half raised: what is made next would belong to root and be open to the user's group.
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

}  // namespace orvel

#endif
