// Making a folder with its missing parents, by descriptors, so that nobody can lead it elsewhere half-way.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>

#include "failure.h"
#include "fault_gate.h"
#include "owner.h"
#include "vexo/filesystem.h"

namespace {

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

// Makes `name` inside `parent` and opens it. A descriptor, or -1 with errno and nothing left of what was made.
int makeOne(int parent, const char* name, const Attributes& attributes) {
    const bool made = mkdirat(parent, name, kModeUntilOwned) == 0;
    if (!made && errno != EEXIST) return -1;
    const int fd = openat(parent, name, (made ? O_RDONLY : O_PATH) | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    if (!made) return fd;
    struct stat status;
    if (fd >= 0 && fstat(fd, &status) == 0 && (!isFresh(status) || handOver(fd, status, attributes))) return fd;
    const int failure = errno;
    if (fd >= 0) close(fd);
    unlinkat(parent, name, AT_REMOVEDIR);
    errno = failure;
    return -1;
}

// Opens `name` inside `parent`, made when it is missing and may be made.
int enter(int parent, const char* name, bool mayMake, const Attributes& attributes) {
    const int fd = openat(parent, name, O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (fd >= 0 || errno != ENOENT || !mayMake) return fd;
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

int VEXOFSMkdirP(const char* path, const char** stopAt, int recursive, uid_t uid, gid_t gid, mode_t mode) {
    VEXO_GATE("VEXOFSMkdirP", -1);
    if (path == nullptr || *path == '\0') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const char* rest = path;
    int folder = open(*path == '/' ? "/" : ".", O_PATH | O_DIRECTORY | O_CLOEXEC);
    while (folder >= 0) {
        const std::string_view component = nextComponent(rest);
        if (component.empty()) break;
        const bool last = rest[strspn(rest, "/")] == '\0';
        const int next = enter(folder, std::string(component).c_str(), recursive != 0 || last, {uid, gid, mode});
        const int failure = errno;
        close(std::exchange(folder, next));
        if (next >= 0) continue;
        if (stopAt != nullptr) *stopAt = component.data();
        return vexo::fail(vexo::errorOfErrno(failure), failure);
    }
    if (folder < 0) return vexo::fail(vexo::errorOfErrno(errno));
    close(folder);
    errno = before;  // looking for what exists left a "missing" there
    return 0;
}
