#include "orvel/share_path.h"

#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "core/path_component.h"
#include "orvel/error_state.h"
#include "vexo/error.h"
#include "vexo/list.h"
#include "vexo/share.h"

namespace orvel {

namespace {

constexpr const char* kSource = "orveldir";
constexpr size_t kSplitSize = 4095;  // bytes of a path that are split, with the terminator
constexpr int kListSize = 1024;

[[nodiscard]] bool findShareRoot(const std::string& name, std::string& root) {
    ShareRecord share;
    if (VEXOShareGet(name.c_str(), acquire(share)) != 0) {
        const bool missing = VLIBCErrGet() == VEXO_ERR_SHARE_MISSING;
        syslog(LOG_ERR, "%s:%d VEXOShareGet fail", kSource, __LINE__);
        OrvLibSetErr(missing ? ORV_ERR_MISSING : ORV_ERR_GENERAL);
        return false;
    }
    root = share->szPath;
    return true;
}

[[nodiscard]] bool findHomeRoot(const std::string& user, std::string& root) {
    if (OrvUserHomeFullPathGet(root, user) != 0) return true;
    syslog(LOG_ERR, "%s:%d OrvUserHomeFullPathGet fail", kSource, __LINE__);
    return false;
}

int resolve(const char* path, std::string& realPath, std::string& shareName, std::string& volumePath,
            std::string& shareRoot, const std::string& userName) {
    if (path == nullptr || *path == '\0' || userName.empty()) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return 0;
    }
    const CString component = pathComponent(path, true);
    if (component == nullptr) {
        syslog(LOG_ERR, "%s:%d OrvLibGetTokOfPath fail", kSource, __LINE__);
        OrvLibSetErr(ORV_ERR_GENERAL);
        return 0;
    }
    const std::string rest = restOfPath(path, component.get());  // before an output that `path` may lie in
    shareName = component.get();
    const bool found =
        IsDirUserHome(shareName, nullptr) ? findHomeRoot(userName, shareRoot) : findShareRoot(shareName, shareRoot);
    if (!found) return 0;
    realPath = shareRoot + rest;
    volumePath = shareRoot.substr(0, shareRoot.find('/', 1));
    return 1;
}

// `out` holds nothing yet, so only as much is read as it has room for.
int reportNullArgument(const char* path, const char* out, int outSize) {
    const size_t room = out == nullptr ? 0 : strnlen(out, static_cast<size_t>(std::max(outSize, 0)));
    VLIBCErrSetEx(VEXO_ERR_PARAMETER, kSource, __LINE__);
    syslog(LOG_ERR, "%s(%d) bad parameter, oldpath=%s, new path=%s", kSource, __LINE__, printable(path).c_str(),
           out == nullptr ? "(null)" : printable(std::string_view(out, room)).c_str());
    return -1;
}

int translate(const char* path, char* out, int outSize) {
    if (path == nullptr || out == nullptr) return reportNullArgument(path, out, outSize);
    const CString component = pathComponent(path, true);
    if (component == nullptr) {
        VLIBCErrSetEx(VEXO_ERR_GENERAL, kSource, __LINE__);
        syslog(LOG_ERR, "%s(%d) OrvLibGetTokOfPath fail", kSource, __LINE__);
        return -1;
    }
    ShareRecord share;
    if (VEXOShareGet(component.get(), acquire(share)) != 0) {
        VLIBCErrSetEx(VEXO_ERR_SHARE_MISSING, kSource, __LINE__);
        return -1;
    }
    // Kept: one byte less than the buffer allows, and the record stays with the process (tests/lsan.supp names it).
    const char* root = share.release()->szPath;
    if (outSize > 1) {
        snprintf(out, static_cast<size_t>(outSize) - 1, "%s%s", root, restOfPath(path, component.get()));
    }
    return 0;
}

// Here alone EPERM and ENOTDIR are general failures.
int codeOfRealpath(int err) {
    switch (err) {
        case ENOENT:
            return ORV_ERR_MISSING;
        case EACCES:
            return ORV_ERR_DENIED;
        default:
            return ORV_ERR_GENERAL;
    }
}

int canonicalise(const char* path, char* resolved, int size) {
    if (path == nullptr || resolved == nullptr || size == 0) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return 0;
    }
    if (realpath(path, resolved) != nullptr) return 1;
    const int failure = errno;
    OrvLibSetErr(codeOfRealpath(failure));
    const std::string shown = printable(path);
    errno = failure;
    syslog(LOG_ERR, "%s:%d readpath(%s) fail (%m)", kSource, __LINE__, shown.c_str());
    errno = failure;
    return 0;
}

int checkEncryption(const std::string& shareName, bool* isEncrypted) {
    if (isEncrypted == nullptr) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return 0;
    }
    *isEncrypted = false;
    if (IsDirUserHome(shareName, nullptr)) return 1;  // homes are never encrypted
    ShareRecord share;
    if (VEXOShareGet(shareName.c_str(), acquire(share)) != 0) {
        syslog(LOG_ERR, "%s:%d VEXOShareGet fail %s", kSource, __LINE__, printable(shareName).c_str());
        OrvLibSetErr(ORV_ERR_MISSING);
        return 0;
    }
    *isEncrypted = (share->fStatus & VEXO_SHARE_ENCRYPTED) != 0;
    return 1;
}

}  // namespace

CString pathComponent(const char* path, bool first) {
    if (path == nullptr) {
        syslog(LOG_ERR, "%s(%d): bad parameter!", kSource, __LINE__);
        return nullptr;
    }
    StringList pieces(VLIBCSzListAlloc(kListSize));
    if (pieces == nullptr) {
        syslog(LOG_ERR, "%s(%d): VLIBCSzListAlloc() failed!", kSource, __LINE__);
        return nullptr;
    }
    if (strchr(path, '/') == nullptr) {
        syslog(LOG_ERR, "%s(%d): bad path name=%s", kSource, __LINE__, printable(path).c_str());
        return nullptr;
    }
    char text[kSplitSize] = {};
    memcpy(text, path, strnlen(path, kSplitSize - 1));
    const int count = VLIBCStrTok(text, "/", lend(pieces));
    if (count <= 0) {
        syslog(LOG_ERR, "%s(%d) error path", kSource, __LINE__);
        return nullptr;
    }
    return CString(strdup(VLIBCSzListGet(pieces.get(), first ? 0 : count - 1)));
}

}  // namespace orvel

char* OrvLibGetTokOfPath(char* path, int first) {
    return orvel::guardedQuietly<char*>(nullptr, [&] { return orvel::pathComponent(path, first != 0).release(); });
}

int OrvFullPathGet(const char* path, std::string& realPath, std::string& shareName, std::string& volumePath,
                   std::string& shareRoot, const std::string& userName) {
    return orvel::guarded(0,
                          [&] { return orvel::resolve(path, realPath, shareName, volumePath, shareRoot, userName); });
}

int OrvLibTransFullPath(char* path, char* out, int outSize) {
    return orvel::guardedQuietly(-1, [&] { return orvel::translate(path, out, outSize); });
}

int OrvLibRealFullPathGet(const char* path, char* resolved, int size) {
    return orvel::guarded(0, [&] { return orvel::canonicalise(path, resolved, size); });
}

int OrvLibCheckEncryptShare(const std::string& shareName, bool* isEncrypted) {
    return orvel::guarded(0, [&] { return orvel::checkEncryption(shareName, isEncrypted); });
}
