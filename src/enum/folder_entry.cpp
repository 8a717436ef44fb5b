#include "enum/folder_entry.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

namespace orvel {
namespace {

constexpr int kNoLink = O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

}  // namespace

bool identify(int fd, FolderIdentity& identity) {
    struct stat status;
    if (fstat(fd, &status) != 0) return false;
    identity = {status.st_dev, status.st_ino};
    return true;
}

EnteredFolder enterFolder(int parent, const char* name) {
    Descriptor folder(openat(parent, name, O_RDONLY | O_NONBLOCK | kNoLink));
    const int openError = folder ? 0 : errno;
    // A folder that cannot be read may still be one that can be entered; a failure of entering is the one that counts.
    const Descriptor place(folder ? -1 : openat(parent, name, O_PATH | kNoLink));
    const int fd = folder ? folder.get() : place.get();
    if (fd < 0) return {Descriptor(), failedStep(errno), errno};
    if (fchdir(fd) != 0) return {Descriptor(), EntryFailure::kChangeDirectory, errno};
    return {std::move(folder), EntryFailure::kOpen, openError};
}

Descriptor reopenFolder(int parent, const char* name, const FolderIdentity& expected) {
    Descriptor folder(openat(parent, name, O_PATH | kNoLink));
    FolderIdentity met{};
    if (folder && identify(folder.get(), met) && met != expected) {
        folder.reset();
        errno = ESTALE;
    }
    return folder;
}

}  // namespace orvel
