// The questions that programs ask before they list, download or upload.
#include <syslog.h>
#include <unistd.h>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/privilege_decision.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";

enum class Looking { kList, kDownload };

// Listing and downloading differ in the mask bits that forbid them, and in that a refused listing sets no code: its
// callers set their own.
bool mayLook(Looking what, const char* user, const char* sid, const char* path) {
    if (path == nullptr) {
        if (what == Looking::kDownload) OrvLibSetErr(ORV_ERR_PARAMETER);
        return false;
    }
    if (IsDirUserHome(path, nullptr)) return true;
    int privilege = ORV_PRIVILEGE_UNKNOWN;
    int mask = 0;
    if (OrvLibGetPrivilege(path, user, sid, &privilege, &mask) < 0) {
        syslog(LOG_ERR, "%s:%d Gailed to check privilege of path %s, reason=[%d] ", kSource, __LINE__,
               printable(path).c_str(), OrvLibGetErr());
        return false;
    }
    const auto bits = static_cast<unsigned>(mask);
    if (what == Looking::kList ? mayList(privilege, bits) : mayDownload(privilege, bits)) return true;
    if (what == Looking::kDownload) OrvLibSetErr(ORV_ERR_DENIED);
    syslog(LOG_ERR, "%s:%d No privilege in path %s", kSource, __LINE__, printable(path).c_str());
    return false;
}

// False with the code set when the share forbids the upload.
bool judgeShareUpload(const char* user, const char* sid, const char* path, UploadVerdict& verdict) {
    int privilege = ORV_PRIVILEGE_UNKNOWN;
    int mask = 0;
    if (OrvLibGetPrivilege(path, user, sid, &privilege, &mask) < 0) {
        syslog(LOG_ERR, "%s:%d Failed to get privilege, path= %s, reason=[%d] ", kSource, __LINE__,
               printable(path).c_str(), OrvLibGetErr());
        return false;
    }
    verdict = judgeUpload(privilege, static_cast<unsigned>(mask));
    if (verdict != UploadVerdict::kRefused) return true;
    OrvLibSetErr(ORV_ERR_DENIED);
    syslog(LOG_ERR, "%s:%d Share no upload privilege, path=%s", kSource, __LINE__, printable(path).c_str());
    return false;
}

bool targetIsFree(const char* user, const char* path) {
    PathInfo target;
    if (!PathInfoFactory::create(user, path, target)) {
        syslog(LOG_ERR, "%s:%d Failed to get path info:%s, reason=[%X]", kSource, __LINE__, printable(path).c_str(),
               static_cast<unsigned>(OrvLibGetErr()));
        return false;
    }
    if (access(target.realPath.c_str(), F_OK) != 0) return true;
    OrvLibSetErr(ORV_ERR_EXISTS);
    syslog(LOG_ERR, "%s:%d Share no modify privilege, path=%s", kSource, __LINE__, printable(path).c_str());
    return false;
}

bool mayUpload(const char* user, const char* sid, const char* path, _tag__type_& overwriteMode) {
    if (path == nullptr) {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return false;
    }
    UploadVerdict verdict = UploadVerdict::kAskTarget;
    if (!IsDirUserHome(path, nullptr) && !judgeShareUpload(user, sid, path, verdict)) return false;
    if (verdict == UploadVerdict::kGranted) {
        overwriteMode = OVERWRITE_MODE_SKIP;  // existing files stay as they are; the target is not looked at
        return true;
    }
    return overwriteMode != OVERWRITE_MODE_ERROR || targetIsFree(user, path);
}

}  // namespace
}  // namespace orvel

bool CheckShareListPrivilege(const char* user, const char* sid, const char* path) {
    return orvel::guarded(false, [&] { return orvel::mayLook(orvel::Looking::kList, user, sid, path); });
}

bool CheckShareDownloadPrivilege(const char* user, const char* sid, const char* path) {
    return orvel::guarded(false, [&] { return orvel::mayLook(orvel::Looking::kDownload, user, sid, path); });
}

bool CheckShareUploadPrivilege(const char* user, const char* sid, const char* path, _tag__type_& overwriteMode) {
    return orvel::guarded(false, [&] { return orvel::mayUpload(user, sid, path, overwriteMode); });
}
