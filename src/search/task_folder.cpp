#include "search/task_folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "base/printable.h"
#include "base/raised_identity.h"
#include "core/owned.h"
#include "orvel/name_check.h"
#include "vexo/error.h"
#include "vexo/process.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelsearch";
constexpr mode_t kEverybody = 0777;  // each user's process keeps its databases there, mode 0600

void makeTemporaryFolder(std::string volume) {
    errno = 0;
    if (OrvCreateTmpDir(volume.data()) == 0) return;
    const int reason = errno;
    VLIBCErrSetEx(reason == ENOSPC ? VEXO_ERR_TMP_NO_SPACE : VEXO_ERR_GENERAL, kSource, __LINE__);
    syslog(LOG_ERR, "%s(%d): failed to create tmp folder %s/%s/%s, errno=%s(%d)", kSource, __LINE__,
           printable(volume).c_str(), "@tmp", "orvel", strerror(reason), reason);
}

bool isThere(const std::string& path) {
    return faccessat(AT_FDCWD, path.c_str(), F_OK, AT_SYMLINK_NOFOLLOW | AT_EACCESS) == 0;
}

// Whoever can write to the temporary folder could have put a link there, to have root make folders elsewhere. Root's
// own links are the operator's business.
bool isForeignLink(const std::string& path) {
    struct stat status {};
    return lstat(path.c_str(), &status) == 0 && S_ISLNK(status.st_mode) && status.st_uid != 0;
}

// Only a folder that this process made, never what a link put in its place leads to.
bool openToEverybody(const std::string& folder) {
    const Descriptor opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    return opened && fstat(opened.get(), &status) == 0 && status.st_uid == geteuid() &&
           fchmod(opened.get(), kEverybody) == 0;
}

void makeFolder(const std::string& folder) {
    if (isThere(folder)) return;
    // Open from the start: one that this process was killed behind would stay closed, since it is there then.
    const mode_t mask = umask(0);
    const int made = VLIBCExec("/bin/mkdir", "-p", folder.c_str(), nullptr);
    umask(mask);
    if (made == 0 && openToEverybody(folder)) return;
    syslog(LOG_ERR, "%s:%d Fail to create folder %s", kSource, __LINE__, printable(folder).c_str());
}

}  // namespace

std::string searchRoot(const std::string& volume) {
    return volume + "/@tmp/orvel/PXSearch";
}

void makeTaskFolders(const std::string& volume, const std::string& taskFolder) {
    const RaisedIdentity root;
    makeTemporaryFolder(volume);
    const std::string top = searchRoot(volume);
    for (const std::string& above : {volume + "/@tmp", volume + "/@tmp/orvel", top}) {
        if (!isForeignLink(above)) continue;
        syslog(LOG_ERR, "%s:%d %s is a user's link, nothing is made below it", kSource, __LINE__,
               printable(above).c_str());
        return;
    }
    makeFolder(top);
    makeFolder(taskFolder);
}

}  // namespace orvel
