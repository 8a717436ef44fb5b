#include "temporary_folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "base/raised_identity.h"
#include "base/random.h"

namespace orvel::cgi {
namespace {

constexpr mode_t kEverybodys = 01777;
constexpr mode_t kOwn = 0700;
constexpr int kMostAttempts = 100;  // against somebody who puts something in the way again and again

Descriptor refuse(int error) {
    errno = error;
    return Descriptor();
}

bool make(const Descriptor& parent, const char* name, mode_t mode) {
    const mode_t mask = umask(0);
    const bool made = mkdirat(parent.get(), name, mode) == 0;
    umask(mask);
    return made || errno == EEXIST;
}

Descriptor openChild(const Descriptor& parent, const char* name, struct stat& status) {
    Descriptor folder(openat(parent.get(), name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    return folder && fstat(folder.get(), &status) == 0 ? std::move(folder) : Descriptor();
}

// What stands in the way keeps its owner and gets another name. False with errno where the process may not.
bool moveAway(const Descriptor& parent, const std::string& name) {
    const RaisedIdentity root;
    const std::string away = name + "-" + draw<16>();
    return renameat(parent.get(), name.c_str(), parent.get(), away.c_str()) == 0 || errno == ENOENT;
}

// Another's, no folder, or gone since it stood there; other failures say nothing of it.
bool standsInTheWay(int error) {
    return error == ENOTDIR || error == ELOOP || error == EACCES || error == ENOENT;
}

// A folder of the system's own, or the caller's, which gets the sticky bit where others may write.
Descriptor openShared(const Descriptor& parent, const char* name) {
    struct stat status {};
    Descriptor folder = make(parent, name, kEverybodys) ? openChild(parent, name, status) : Descriptor();
    if (!folder) return folder;
    if (status.st_uid != 0 && status.st_uid != geteuid()) return refuse(EACCES);
    const bool safe = (status.st_mode & S_ISVTX) != 0 || (status.st_mode & 0022) == 0;
    return safe || fchmod(folder.get(), (status.st_mode & 07777) | S_ISVTX) == 0 ? std::move(folder) : Descriptor();
}

}  // namespace

Descriptor openTemporaryFolder(const std::string& volumePath) {
    const RaisedIdentity root;
    const Descriptor volume(open(volumePath.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    const Descriptor outer = volume ? openShared(volume, "@tmp") : Descriptor();
    if (!outer) return Descriptor();
    for (int attempt = 0;; ++attempt) {
        Descriptor inner = openShared(outer, "orvel");
        const bool given = inner || !standsInTheWay(errno) || attempt == kMostAttempts;
        if (given || !moveAway(outer, "orvel")) return inner;
    }
}

Descriptor openOwnFolder(const Descriptor& temporary, const std::string& name) {
    for (int attempt = 0; attempt < kMostAttempts; ++attempt) {
        struct stat status {};
        if (!make(temporary, name.c_str(), kOwn)) return Descriptor();
        Descriptor folder = openChild(temporary, name.c_str(), status);
        if (folder && status.st_uid == geteuid() && (status.st_mode & 0077) == 0) return folder;
        if (!folder && !standsInTheWay(errno)) return Descriptor();
        if (!moveAway(temporary, name)) return refuse(EACCES);
    }
    return refuse(EACCES);
}

}  // namespace orvel::cgi
