#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/fat_name.h"
#include "orvel/error_state.h"
#include "orvel/name_check.h"
#include "orvel/privilege.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvman";
constexpr std::size_t kLongestPath = 4095;

int refuse(int code, int platformError, int line) {
    OrvLibSetErr(code);
    VLIBCErrSetEx(platformError, kSource, line);
    return -1;
}

// Cuts `path` back to its longest prefix that exists; it ends empty when not even the first component does.
[[nodiscard]] bool cutToExisting(std::string& path) {
    while (!path.empty() && access(path.c_str(), F_OK) != 0) {
        const int reason = errno;
        const std::size_t slash = path.rfind('/');
        if (slash == std::string::npos) {
            refuse(ORV_ERR_PARAMETER, VEXO_ERR_GENERAL, __LINE__);
            syslog(LOG_ERR, "%s:%d Failed to strrchr '/' for %s, reason=%s", kSource, __LINE__, printable(path).c_str(),
                   strerror(reason));
            return false;
        }
        path.resize(slash);
    }
    return true;
}

[[nodiscard]] bool isRemoteMount(const std::string& path) {
    return !path.empty() && VEXOFSIsInMountTable(path.c_str()) != -1 &&
           VEXOFSIsRemoteFS(VEXOGetFSType(path.c_str(), 0)) == 1;
}

int refuseUnreadable(const std::string& path, int reason) {
    switch (reason) {
        case EACCES:
        case EPERM:
            return refuse(ORV_ERR_DENIED, VEXO_ERR_DENIED, __LINE__);
        case ENOENT:
        case EIO:
        case ENXIO:
        case EHOSTDOWN:
            if (isRemoteMount(path)) return refuse(ORV_ERR_REMOTE, VEXO_ERR_REMOTE_MOUNT, __LINE__);
            return refuse(ORV_ERR_MISSING, VEXO_ERR_MISSING, __LINE__);
        default:
            refuse(ORV_ERR_GENERAL, VEXO_ERR_GENERAL, __LINE__);
            syslog(LOG_ERR, "%s:%d Failed to lstat %s, reason=%s", kSource, __LINE__, printable(path).c_str(),
                   strerror(reason));
            return -1;
    }
}

int checkExisting(const std::string& path, int aclBits) {
    if (path == "/") return refuse(ORV_ERR_MISSING, VEXO_ERR_MISSING, __LINE__);
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0) return refuseUnreadable(path, errno);
    if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) {
        refuse(ORV_ERR_GENERAL, VEXO_ERR_GENERAL, __LINE__);
        syslog(LOG_ERR, "%s:%d Path is not regular file and directory:%s", kSource, __LINE__, printable(path).c_str());
        return -1;
    }
    if (aclBits != ORV_NO_ACL_TEST && ACLAccess(path.c_str(), aclBits) != 0) {
        syslog(LOG_ERR, "%s:%d Can't access %s, errno=%X ", kSource, __LINE__, printable(path).c_str(),
               static_cast<unsigned>(OrvLibGetErr()));
        return -1;
    }
    return 0;
}

[[nodiscard]] bool fatStoresEach(std::string_view components) {
    while (!components.empty()) {
        const std::size_t slash = components.find('/');
        if (!fatStores(components.substr(0, slash))) return false;
        if (slash == std::string_view::npos) break;
        components.remove_prefix(slash + 1);
    }
    return true;
}

// What lies beyond the existing part must suit its file system. When the existing part is just the first component
// nothing is checked (kept: a volume that stands alone is judged when the share below it is).
int checkMissing(const std::string& path, const std::string& existing) {
    const std::size_t length = existing.size();
    const bool nothingBeyond = path.size() <= length + 1;
    const bool onlyFirstComponent = path.find('/', 1) == length;
    if (nothingBeyond || onlyFirstComponent) return 0;

    const int fsType = VEXOGetFSType(existing.c_str(), 0);
    if (fsType < 0) {
        const int reason = errno;
        OrvLibSetErr(OrvParseErrnoToError(reason, nullptr, nullptr));
        syslog(LOG_ERR, "%s:%d Failed to statfs %s, reason=%s", kSource, __LINE__, printable(existing).c_str(),
               strerror(reason));
        return -1;
    }
    if (fsType == VEXO_FS_FAT && !fatStoresEach(std::string_view(path).substr(length + 1))) {
        OrvLibSetErr(ORV_ERR_FAT_NAME);
        return -1;
    }
    return 0;
}

int checkPath(const char* realPath, bool walkUp, int aclBits, std::string* existingPart) {
    if (realPath == nullptr || *realPath == '\0') {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return -1;
    }
    if (*realPath != '/') return refuse(ORV_ERR_PARAMETER, VEXO_ERR_PARAMETER, __LINE__);
    const std::string path(std::string_view(realPath).substr(0, kLongestPath));
    // An empty first component is the one that is tested, and before all else; reserved names are not (kept).
    if (path.starts_with("//") && !OrvCheckReservedName("")) return -1;

    std::string existing = path;
    if (walkUp && !cutToExisting(existing)) return -1;
    if (checkExisting(existing, aclBits) != 0) return -1;
    if (existingPart != nullptr) *existingPart = existing;
    return checkMissing(path, existing);
}

}  // namespace
}  // namespace orvel

int OrvCheckPath(const char* realPath, bool walkUp, int aclBits, std::string* existingPart) {
    return orvel::guarded(-1, [&] { return orvel::checkPath(realPath, walkUp, aclBits, existingPart); });
}
