// Making a folder with its missing parents, by descriptors, so that nobody can lead it elsewhere half-way. Each is made
// under a hidden name, handed to its owner, and only then given its own.
#include <dirent.h>

#include <climits>
#include <cstdio>
#include <cstring>
#include <exception>
#include <memory>
#include <string>
#include <string_view>

#include "accounts/user_home.h"
#include "base/owner.h"
#include "failure.h"
#include "fault_gate.h"
#include "filesystem/owner.h"
#include "io/file_io.h"
#include "vexo/filesystem.h"

namespace {

using orvel::Descriptor;

struct Attributes {
    uid_t uid;
    gid_t gid;
    mode_t mode;
};

constexpr mode_t kModeUntilOwned = 0700;
constexpr mode_t kSystemMode = 0755;
constexpr uid_t kKeep = static_cast<uid_t>(-1);
constexpr int kAttempts = 100;

bool isEmpty(int fd) {
    const std::unique_ptr<DIR, orvel::Releaser<closedir>> folder(
        fdopendir(vexo::openFile(fd, ".", O_RDONLY | O_DIRECTORY).release()));
    if (folder == nullptr) return false;
    int entries = 0;
    errno = 0;
    while (entries <= 2 && readdir(folder.get()) != nullptr) ++entries;
    return entries <= 2 && errno == 0;
}

// A folder made here is the maker's and empty, or already the user's when another process was killed behind that.
// Whatever else stands under a part name was put there by somebody and keeps its owner.
bool isOurs(int fd, const struct stat& status, const Attributes& attributes) {
    return status.st_uid == attributes.uid || (status.st_uid == geteuid() && isEmpty(fd));
}

// Gives the folder `fd` its owner and then its mode. The set-group bit that it took over from its parent stays.
bool handOver(int fd, const struct stat& status, const Attributes& attributes) {
    return vexo::setOwner(fd, attributes.uid, attributes.gid) &&
           vexo::setMode(fd, (attributes.mode & 07777) | (status.st_mode & S_ISGID));
}

// What `name` is called until it is whole. It depends on nothing else than name and owner, so the next process that
// makes the same folder goes on with what a killed one left.
std::string partName(const std::string& name, const Attributes& attributes) {
    const uid_t owner = attributes.uid == kKeep ? geteuid() : attributes.uid;
    const std::string part = VEXO_PART_PREFIX + std::to_string(owner) + "-" + name;
    return part.substr(0, NAME_MAX);
}

// Opens the folder of this name, made when it is missing, once nobody else is at work on it.
Descriptor openPart(int parent, const char* part) {
    if (mkdirat(parent, part, kModeUntilOwned) != 0 && errno != EEXIST) return Descriptor();
    Descriptor fd = vexo::openFile(parent, part, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    // Where folders cannot be locked it goes without: every step may be done twice.
    if (fd) static_cast<void>(vexo::lockFile(fd.get(), LOCK_EX));
    return fd;
}

// EEXIST when the name is taken.
bool publish(int parent, const char* part, const char* name) {
    if (renameat2(parent, part, parent, name, RENAME_NOREPLACE) == 0) return true;
    if (errno != EINVAL && errno != ENOSYS) return false;
    struct stat status;
    if (fstatat(parent, name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
        errno = EEXIST;
        return false;
    }
    return errno == ENOENT && renameat(parent, part, parent, name) == 0;  // replaces at most an empty folder
}

bool isNamed(int fd, int parent, const char* name) {
    struct stat open;
    struct stat named;
    return fstat(fd, &open) == 0 && fstatat(parent, name, &named, AT_SYMLINK_NOFOLLOW) == 0 &&
           vexo::isSameFile(open, named);
}

// Gives the part folder `fd` to its owner and then its name.
bool finish(int fd, int parent, const char* part, const char* name, const Attributes& attributes) {
    struct stat status;
    return fstat(fd, &status) == 0 && (!isOurs(fd, status, attributes) || handOver(fd, status, attributes)) &&
           publish(parent, part, name);
}

// Makes `name` inside `parent` and opens it, or opens what came there meanwhile. It has its owner and mode before it
// bears its name, so nobody meets a folder that is not yet its owner's. Empty with errno, and nothing left, on failure.
Descriptor makeOne(int parent, const std::string& name, const Attributes& attributes) {
    const std::string part = partName(name, attributes);
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        Descriptor fd = openPart(parent, part.c_str());
        const bool isPart = fd && isNamed(fd.get(), parent, part.c_str());
        if (isPart && finish(fd.get(), parent, part.c_str(), name.c_str(), attributes)) return fd;
        const int failure = fd && !isPart ? ENOENT : errno;
        if (isPart) unlinkat(parent, part.c_str(), AT_REMOVEDIR);
        if (failure != EEXIST && failure != ENOENT) {
            errno = failure;
            return Descriptor();
        }
        // Another process was faster.
        fd = vexo::openFile(parent, name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW);
        if (fd || errno != ENOENT) return fd;
    }
    return Descriptor();
}

// A domain's folder was handed to the domain's first user once, and with it everybody's homes there.
void takeBack(int fd, int parent, const std::string& name, uid_t user) {
    struct stat status;
    if (user == 0 || geteuid() != 0 || fstat(fd, &status) != 0 || status.st_uid != user) return;
    if (!isNamed(fd, parent, name.c_str())) return;  // a link
    const Descriptor folder = vexo::openFile(fd, ".", O_RDONLY | O_DIRECTORY);
    if (folder) static_cast<void>(handOver(folder.get(), status, {0, 0, kSystemMode}));
}

// Opens the folder `name` inside `parent`, the one at `at` of a longer path when `above` something else; made when it
// is missing and may be made.
Descriptor enter(int parent, const std::string& name, std::string_view at, bool above, bool mayMake,
                 const Attributes& attributes) {
    constexpr Attributes system = {kKeep, kKeep, kSystemMode};
    Descriptor fd = vexo::openFile(parent, name.c_str(), O_PATH | O_DIRECTORY);
    if (fd && above && name.front() == '@' && vexo::isAboveHomes(at, attributes.uid))
        takeBack(fd.get(), parent, name, attributes.uid);
    if (fd || errno != ENOENT || !mayMake) return fd;
    return makeOne(parent, name, above && vexo::isAboveHomes(at, attributes.uid) ? system : attributes);
}

// The next component of `rest`, which moves behind it; empty at the end.
std::string_view nextComponent(const char*& rest) {
    rest += strspn(rest, "/");
    const std::string_view component(rest, strcspn(rest, "/"));
    rest += component.size();
    return component;
}

}  // namespace

int VEXOFSMkdirP(const char* path, const char** stopAt, int recursive, uid_t uid, gid_t gid, mode_t mode) try {
    VEXO_GATE("VEXOFSMkdirP", -1);
    if (path == nullptr || *path == '\0') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const char* rest = path;
    Descriptor folder = vexo::openFile(*path == '/' ? "/" : ".", O_PATH | O_DIRECTORY);
    while (folder) {
        const std::string component(nextComponent(rest));
        if (component.empty()) {
            errno = before;  // looking for what exists left a "missing" there
            return 0;
        }
        const bool last = rest[strspn(rest, "/")] == '\0';
        Descriptor next = enter(folder.get(), component, {path, rest}, !last, recursive != 0 || last, {uid, gid, mode});
        if (!next && stopAt != nullptr) *stopAt = rest - component.size();
        folder = std::move(next);
    }
    return vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
