#include "user_folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "base/file.h"
#include "base/raised_identity.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW;

bool makeFolder(const std::string& store, const std::string& path, uid_t uid, gid_t gid) {
    const RaisedIdentity root;
    constexpr uid_t keep = static_cast<uid_t>(-1);
    const bool asRoot = geteuid() == 0;
    return VEXOFSMkdirP(store.c_str(), nullptr, 1, keep, keep, 0755) == 0 &&
           VEXOFSMkdirP(path.c_str(), nullptr, 0, asRoot ? uid : keep, asRoot ? gid : keep, 0700) == 0;
}

}  // namespace

Descriptor openUserFolder(const char* store, const std::string& user, bool make) {
    uid_t uid = 0;
    gid_t gid = 0;
    if (VEXOUserGetUGID(user.c_str(), &uid, &gid) != 0) {
        errno = ENOENT;
        return Descriptor();
    }
    const std::string folder = VEXO::SystemPath(store), path = folder + "/" + std::to_string(uid);
    Descriptor own = openFile(path, kOpenFolder);
    if (!own && errno == ENOENT && make && makeFolder(folder, path, uid, gid)) own = openFile(path, kOpenFolder);
    struct stat status {};
    if (!own || fstat(own.get(), &status) != 0) return Descriptor();
    if ((status.st_uid == uid || status.st_uid == geteuid()) && (status.st_mode & 0077) == 0) return own;
    errno = EACCES;
    return Descriptor();
}

}  // namespace orvel::cgi
