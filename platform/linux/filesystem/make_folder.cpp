// Making a folder with its missing parents, by descriptors, so that nobody can lead it elsewhere half-way.
#include <cstring>
#include <exception>
#include <string>
#include <string_view>

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

// A folder that this call made is empty, the caller's own and still closed to others. Anything else under the name was
// put there meanwhile and keeps its owner.
bool isFresh(const struct stat& status) {
    return status.st_uid == geteuid() && (status.st_mode & 0777) == kModeUntilOwned && status.st_nlink <= 2;
}

// Gives the folder `fd`, which was just made, its owner and then its mode. The set-group bit that it took over from its
// parent stays.
bool handOver(int fd, const struct stat& status, const Attributes& attributes) {
    return vexo::setOwner(fd, attributes.uid, attributes.gid) &&
           vexo::setMode(fd, (attributes.mode & 07777) | (status.st_mode & S_ISGID));
}

// Makes `name` inside `parent` and opens it. Empty with errno, and nothing left of what was made, on failure.
Descriptor makeOne(int parent, const char* name, const Attributes& attributes) {
    const bool made = mkdirat(parent, name, kModeUntilOwned) == 0;
    if (!made && errno != EEXIST) return Descriptor();
    Descriptor fd = vexo::openFile(parent, name, (made ? O_RDONLY : O_PATH) | O_DIRECTORY | O_NOFOLLOW);
    if (!made) return fd;
    struct stat status;
    if (fd && fstat(fd.get(), &status) == 0 && (!isFresh(status) || handOver(fd.get(), status, attributes))) return fd;
    const vexo::KeepErrno keep;
    unlinkat(parent, name, AT_REMOVEDIR);
    return Descriptor();
}

// Opens `name` inside `parent`, made when it is missing and may be made.
Descriptor enter(int parent, const char* name, bool mayMake, const Attributes& attributes) {
    Descriptor fd = vexo::openFile(parent, name, O_PATH | O_DIRECTORY);
    if (fd || errno != ENOENT || !mayMake) return fd;
    return makeOne(parent, name, attributes);
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
        folder = enter(folder.get(), component.c_str(), recursive != 0 || last, {uid, gid, mode});
        if (!folder && stopAt != nullptr) *stopAt = rest - component.size();
    }
    return vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
