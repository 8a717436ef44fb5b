#include "operation/tree_remove.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "folder_names.h"
#include "orvel/error_state.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

bool failed(const Entry& entry, Progress& progress, int error) {
    progress.failed(entry.path, OrvParseErrnoToError(error, nullptr, nullptr));
    return false;
}

constexpr int kDeepest = 3000;  // each level costs a descriptor and some of the stack

void removeQuietly(int folder, const std::string& name, dev_t device, int depth) {
    if (unlinkat(folder, name.c_str(), 0) == 0 || depth == kDeepest) return;
    const Descriptor inside(openat(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    std::vector<std::string> names;
    if (!inside || fstat(inside.get(), &status) != 0 || status.st_dev != device) return;
    if (!namesIn(inside.get(), Hidden::kInclude, names)) return;
    for (const std::string& child : names) removeQuietly(inside.get(), child, device, depth + 1);
    unlinkat(folder, name.c_str(), AT_REMOVEDIR);
}

bool removeIn(const Entry& entry, dev_t device, int depth, Progress& progress);

// Everything in the folder. Errors are reported for each item in it.
bool emptyFolder(const Entry& entry, dev_t device, int depth, Progress& progress) {
    const Descriptor folder(openat(entry.folder, entry.name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    std::vector<std::string> names;
    if (!folder || fstat(folder.get(), &status) != 0) return failed(entry, progress, errno);
    if (status.st_dev != device || depth == kDeepest) {
        progress.failed(entry.path, depth == kDeepest ? ORV_ERR_LONG_PATH : ORV_ERR_MOUNT_BUSY);
        return false;
    }
    if (!namesIn(folder.get(), Hidden::kInclude, names)) return failed(entry, progress, errno);
    bool all = true;
    bool vetoed = false;
    for (const std::string& name : names) {
        if (progress.stopped()) return false;
        VEXOShareNamesOf(folder.get());
        if (VEXOShareVetoes(name.c_str()) != 0) {
            vetoed = true;
        } else if (VEXOEAIsHiddenFile(name.c_str()) != 0) {
            removeQuietly(folder.get(), name, device, depth);
        } else {
            all = removeIn(entry.child(folder.get(), name), device, depth + 1, progress) && all;
        }
    }
    if (vetoed) return failed(entry, progress, ENOTEMPTY);  // what is kept out stays, and the folder with it
    if (!all) progress.skipped();                           // it stays, with what stayed in it
    return all;
}

bool removeIn(const Entry& entry, dev_t device, int depth, Progress& progress) {
    progress.begin(entry.path);
    struct stat status {};
    if (fstatat(entry.folder, entry.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
        return failed(entry, progress, errno);
    }
    const bool isFolder = S_ISDIR(status.st_mode);
    if (isFolder && !emptyFolder(entry, device, depth, progress)) return false;
    if (unlinkat(entry.folder, entry.name.c_str(), isFolder ? AT_REMOVEDIR : 0) != 0) {
        return failed(entry, progress, errno);
    }
    if (S_ISREG(status.st_mode)) progress.bytes(status.st_size);
    progress.done();
    return true;
}

}  // namespace

void removeTreeQuietly(int folder, const std::string& name) {
    struct stat status {};
    if (fstat(folder, &status) == 0) removeQuietly(folder, name, status.st_dev, 0);
}

bool removeTree(const Entry& entry, Progress& progress) {
    struct stat status {};
    // Its folder's, since the entry itself may be where another file system is mounted.
    if (fstat(entry.folder, &status) != 0) return failed(entry, progress, errno);
    return removeIn(entry, status.st_dev, 0, progress);
}

}  // namespace orvel::cgi
