// Filling the platform's error slot.
#ifndef VEXO_LINUX_FAILURE_H
#define VEXO_LINUX_FAILURE_H

#include <cerrno>

#include "base/keep_errno.h"
#include "vexo/error.h"

namespace vexo {

// Fills the slot with `code` and the caller's place, and gives -1 to return. errno stays as it is.
inline int fail(int code, const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    VLIBCErrSetEx(code, file, line);
    return -1;
}

// The same for a failure found here rather than in the kernel: errno becomes `systemCode`.
inline int fail(int code, int systemCode, const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    errno = systemCode;
    return fail(code, file, line);
}

// The platform error number that an operation which makes or writes files reports for an errno value.
inline int errorOfErrno(int systemCode) {
    switch (systemCode) {
        case ENOENT:
            return VEXO_ERR_MISSING;
        case ENOTDIR:
        case ELOOP:
            return VEXO_ERR_BAD_PATH;
        case EACCES:
        case EPERM:
            return VEXO_ERR_DENIED;
        case EEXIST:
            return VEXO_ERR_EXISTS;
        case EDQUOT:
            return VEXO_ERR_QUOTA;
        case ENOSPC:
            return VEXO_ERR_NO_SPACE;
        case EROFS:
            return VEXO_ERR_READ_ONLY;
        case EFBIG:
            return VEXO_ERR_FILE_TOO_LARGE;
        case ECANCELED:
            return VEXO_ERR_CANCELLED;
        case ENAMETOOLONG:
            return VEXO_ERR_NAME_TOO_LONG;
        default:
            return VEXO_ERR_GENERAL;
    }
}

using orvel::KeepErrno;

}  // namespace vexo

#endif
