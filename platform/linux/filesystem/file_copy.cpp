#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <exception>
#include <string>
#include <string_view>

#include "base/new_file.h"
#include "failure.h"
#include "fault_gate.h"
#include "filesystem/copy_data.h"
#include "filesystem/file_permissions.h"
#include "filesystem/mount_table.h"
#include "filesystem/owner.h"
#include "io/file_io.h"
#include "vexo/copy.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace {

using orvel::Descriptor;

constexpr uid_t kKeepUser = static_cast<uid_t>(-1);
constexpr gid_t kKeepGroup = static_cast<gid_t>(-1);
constexpr mode_t kNewFile = 0666;
constexpr mode_t kUmask = 022;

struct Copy {
    Descriptor source;
    struct stat sourceStatus {};
    Descriptor folder;  // the target's
    std::string name;   // the target's
    bool exists = false;
    struct stat oldStatus {};  // what is at the target, when it exists
    VEXOCOPYOPT options{};
    int (*isExpected)(const struct stat*, const struct stat*, void*) = nullptr;  // of the file to be replaced
    void* of = nullptr;
};

int openSource(const char* path, Copy& copy) {
    // Not waiting for the writer of a pipe; a link as last component is refused by the kernel.
    copy.source = vexo::openFile(AT_FDCWD, path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    if (!copy.source && (errno == ENXIO || errno == ENODEV)) return vexo::fail(VEXO_ERR_BAD_PATH);  // socket, device
    if (!copy.source || fstat(copy.source.get(), &copy.sourceStatus) != 0) {
        return vexo::fail(vexo::errorOfErrno(errno));
    }
    if (S_ISREG(copy.sourceStatus.st_mode)) return 0;
    return vexo::fail(VEXO_ERR_BAD_PATH, S_ISDIR(copy.sourceStatus.st_mode) ? EISDIR : EINVAL);
}

int openTarget(const char* path, Copy& copy) {
    const std::string_view whole = path;
    const size_t slash = whole.rfind('/');
    const std::string folder(slash == std::string_view::npos ? "." : whole.substr(0, slash + 1));
    copy.name = whole.substr(slash + 1);  // npos + 1 is 0
    if (copy.name.empty() || copy.name == "." || copy.name == "..") return vexo::fail(VEXO_ERR_BAD_PATH, EINVAL);
    copy.folder = vexo::openFile(folder, O_PATH | O_DIRECTORY);
    return copy.folder ? 0 : vexo::fail(vexo::errorOfErrno(errno));
}

bool isOnFat(const char* path) {
    const vexo::MountTable* table = vexo::mountTable();
    const vexo::Mount* mount = table == nullptr ? nullptr : vexo::mountHolding(*table, path);
    return mount != nullptr && mount->type == VEXO_FS_FAT;
}

int checkTarget(const char* path, Copy& copy) {
    if (copy.name.find_first_of("\\/:*?\"><|\r\n") != std::string::npos && isOnFat(path)) {
        return vexo::fail(VEXO_ERR_FAT_NAME, EINVAL);
    }
    if (fstatat(copy.folder.get(), copy.name.c_str(), &copy.oldStatus, AT_SYMLINK_NOFOLLOW) != 0) {
        return errno == ENOENT ? 0 : vexo::fail(vexo::errorOfErrno(errno));
    }
    copy.exists = true;
    const struct stat& old = copy.oldStatus;
    if (vexo::isSameFile(old, copy.sourceStatus)) {
        return vexo::fail(VEXO_ERR_EXISTS, EEXIST);
    }
    if (!S_ISREG(old.st_mode)) return vexo::fail(VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST);
    const bool mayReplace = (copy.options.switches & VEXO_COPY_OVERWRITE) != 0;
    return mayReplace ? 0 : vexo::fail(VEXO_ERR_TARGET_EXISTS, EEXIST);
}

bool takeOverPermissions(const Copy& copy, int file) {
    return vexo::takeOverPermissions(copy.folder.get(), copy.name.c_str(), copy.oldStatus.st_mode, file);
}

bool keepsMode(const Copy& copy) {
    return (copy.options.switches & VEXO_COPY_KEEP_MODE) != 0 && !copy.exists;
}

// What a file that replaces none gets.
bool giveNew(const Copy& copy, int file) {
    const bool keeps = keepsMode(copy);
    const mode_t mode = keeps ? copy.sourceStatus.st_mode & 0777 : kNewFile;
    return VEXOShareGiveNew(copy.folder.get(), file, mode, keeps ? VEXO_NEW_OWN_MODE : 0, copy.options.uid,
                            copy.options.gid) == 0;
}

bool create(const Copy& copy, orvel::NewFile& part) {
    // A part is closed to others until it has the permissions of another file.
    const vexo::Umask mask(kUmask);
    return part.create(copy.name, copy.exists || keepsMode(copy) ? 0600 : kNewFile) &&
           (!copy.exists || vexo::setOwner(part.get(), copy.options.uid, copy.options.gid));
}

// What a network file system could not write yet is reported when a descriptor closes.
bool reportDelayedFailure(int fd) {
    const int second = fcntl(fd, F_DUPFD_CLOEXEC, 0);
    return second >= 0 && close(second) == 0;
}

// Whether the file is on the disk, where that is asked for. What replaces a file is waited for in any case.
bool isSynced(const Copy& copy, int file) {
    return (copy.options.switches & VEXO_COPY_SYNC) == 0 || fsync(file) == 0;
}

bool fill(const Copy& copy, int part) {
    const VEXOCOPYOPT& options = copy.options;
    const struct stat& from = copy.sourceStatus;
    if (!vexo::copyData(copy.source.get(), part, from.st_size, options.isCancelled)) return false;
    if (copy.exists && !takeOverPermissions(copy, part)) return false;
    if (!copy.exists && !giveNew(copy, part)) return false;
    if ((options.switches & VEXO_COPY_KEEP_TIMES) != 0) {
        const std::array<timespec, 2> times = {from.st_atim, from.st_mtim};
        if (futimens(part, times.data()) != 0) return false;
    }
    if (!isSynced(copy, part)) return false;
    if (!reportDelayedFailure(part)) return false;
    if (options.isCancelled == nullptr || options.isCancelled() == 0) return true;
    errno = ECANCELED;
    return false;
}

bool publishIfExpected(const Copy& copy, orvel::NewFile& part) {
    struct stat fresh {};
    if (fstat(part.get(), &fresh) != 0) return false;
    return part.publishInPlaceOf(copy.name,
                                 [&](const struct stat& old) { return copy.isExpected(&old, &fresh, copy.of) != 0; });
}

bool publish(const Copy& copy, orvel::NewFile& part) {
    if (copy.isExpected != nullptr) return publishIfExpected(copy, part);
    if (part.publish(copy.name, copy.exists)) return true;
    // Put there since the target was looked at.
    const bool mayReplace = (copy.options.switches & VEXO_COPY_OVERWRITE) != 0;
    return errno == EEXIST && mayReplace && !copy.exists && part.publish(copy.name, true);
}

int errorOfPublishing(int systemCode) {
    switch (systemCode) {
        case EEXIST:
        case ESTALE:
        case ETXTBSY:
            return VEXO_ERR_TARGET_EXISTS;
        case EISDIR:
            return VEXO_ERR_TARGET_EXISTS_OTHER;
        case EINVAL:  // all else was valid, so it is the name that the file system cannot hold
            return VEXO_ERR_FAT_NAME;
        default:
            return vexo::errorOfErrno(systemCode);
    }
}

// Whether the source itself can become the target, as its owner allows. A new file in a folder with a default ACL gets
// its permissions from there, which only making it anew does.
bool mayTake(const Copy& copy) {
    struct stat folder {};
    const struct stat& from = copy.sourceStatus;
    return (copy.options.switches & VEXO_COPY_TAKE) != 0 && fstat(copy.folder.get(), &folder) == 0 &&
           folder.st_dev == from.st_dev && from.st_nlink == 1 && (from.st_uid == geteuid() || geteuid() == 0) &&
           (copy.exists || !vexo::hasDefaultAcl(copy.folder.get()));
}

// Removes the source's name, unless somebody put another file there: the target was made through the descriptor.
void dropName(const char* source, const Copy& copy) {
    struct stat now {};
    if (lstat(source, &now) == 0 && vexo::isSameFile(now, copy.sourceStatus)) {
        unlink(source);
    }
}

// Makes the source the target. False with errno; nothing has changed then but the source's owner and permissions.
bool take(const char* source, const Copy& copy) {
    const int file = copy.source.get();
    if (!copy.exists && !giveNew(copy, file)) return false;
    if (copy.exists && !takeOverPermissions(copy, file)) return false;
    if (copy.exists && !vexo::setOwner(file, copy.options.uid, copy.options.gid)) return false;
    if (!isSynced(copy, file)) return false;
    if (copy.options.isCancelled != nullptr && copy.options.isCancelled() != 0) {
        errno = ECANCELED;
        return false;
    }
    orvel::NewFile part(copy.folder.get());
    if (!part.adopt(file) || !publish(copy, part)) return false;
    dropName(source, copy);
    return true;
}

int run(const char* source, const char* target, Copy& copy) {
    const int before = errno;
    if (openSource(source, copy) != 0 || openTarget(target, copy) != 0 || checkTarget(target, copy) != 0) return -1;
    if (copy.isExpected != nullptr && !copy.exists) return vexo::fail(VEXO_ERR_TARGET_EXISTS, ESTALE);
    if (mayTake(copy)) {
        if (take(source, copy)) {
            errno = before;
            return 0;
        }
        if (errno == ECANCELED) return vexo::fail(VEXO_ERR_CANCELLED);
        // Put there meanwhile: a copy would not get the name either.
        if (errno == EEXIST || errno == EISDIR || errno == ESTALE || errno == ETXTBSY) {
            return vexo::fail(errorOfPublishing(errno));
        }
        // A file system that cannot: copied like any other.
    }
    orvel::NewFile part(copy.folder.get());
    if (!create(copy, part) || !fill(copy, part.get())) return vexo::fail(vexo::errorOfErrno(errno));
    if (!publish(copy, part)) return vexo::fail(errorOfPublishing(errno));
    errno = before;
    return 0;
}

bool areUsable(const char* source, const char* target) {
    return source != nullptr && target != nullptr && *source != '\0' && *target != '\0';
}

}  // namespace

int VEXOFileCopy(const char* source, const char* target, const VEXOCOPYOPT* options) try {
    VEXO_GATE("VEXOFileCopy", -1);
    if (!areUsable(source, target)) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    Copy copy;
    copy.options = options != nullptr ? *options : VEXOCOPYOPT{kKeepUser, kKeepGroup, nullptr, 0};
    return run(source, target, copy);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOFileReplace(const char* source, const char* target, const VEXOCOPYOPT* options,
                    int (*isExpected)(const struct stat*, const struct stat*, void*), void* of) try {
    VEXO_GATE("VEXOFileReplace", -1);
    if (!areUsable(source, target) || isExpected == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    Copy copy;
    copy.options = options != nullptr ? *options : VEXOCOPYOPT{kKeepUser, kKeepGroup, nullptr, 0};
    copy.options.switches |= VEXO_COPY_OVERWRITE;
    copy.isExpected = isExpected;
    copy.of = of;
    return run(source, target, copy);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

long long VEXOFileCopyDone() {
    return vexo::copiedBytes();
}
