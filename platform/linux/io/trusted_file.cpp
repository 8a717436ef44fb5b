#include "io/trusted_file.h"

#include "failure.h"

namespace vexo {
namespace {

constexpr int kAttempts = 100;  // at a file that is replaced all the time

}  // namespace

Descriptor openTrusted(const std::string& path, int flags, mode_t mode) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        Descriptor fd = openFile(path, flags | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY, mode);
        if (!fd) {
            // A link, a folder and a socket or pipe that nobody reads: each is a name that somebody else took.
            if (errno == ELOOP || errno == EISDIR || errno == ENXIO) errno = EACCES;
            return fd;
        }
        struct stat status {};
        if (fstat(fd.get(), &status) != 0) break;
        if (isTrusted(status, S_IFREG)) return fd;
        if (status.st_nlink != 0) break;  // else it was replaced since it was opened
    }
    errno = EACCES;
    return Descriptor();
}

bool isTrustedFile(const std::string& path) {
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0) return false;
    if (isTrusted(status, S_IFREG)) return true;
    errno = EACCES;
    return false;
}

int errorOfFile(int systemCode) {
    switch (systemCode) {
        case ENOENT:
        case ENOTDIR:
            return VEXO_ERR_FILE;
        case EACCES:
        case EPERM:
        case ENOSPC:
        case EDQUOT:
        case EROFS:
            return errorOfErrno(systemCode);
        default:
            return VEXO_ERR_GENERAL;
    }
}

}  // namespace vexo
