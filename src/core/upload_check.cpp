#include "orvel/upload_check.h"

#include <syslog.h>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/identity_state.h"
#include "core/owned.h"
#include "orvel/error_state.h"
#include "orvel/identity.h"
#include "orvel/name_check.h"
#include "orvel/share_path.h"
#include "vexo/copy.h"
#include "vexo/error.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelupload";
constexpr const char* kApplication = "VEXO.QDS.App.Quorvane3.Instance";
constexpr int kSessionFlags = 15;

bool isAuthorized(WebMan& webMan, const char* appId) {
    if (!webMan.IsAuthorized(appId, kSessionFlags, CGI_POSITION_DESKTOP)) return false;
    return VLIBUserPrivilegeHas(webMan.GetLoginUserName().c_str(), kApplication) != 0;
}

int checkFile(const std::string& path, const char* user, const char* sid, _tag__type_& overwriteMode) {
    std::string realPath, shareName, volumePath, shareRoot;
    if (OrvFullPathGet(path.c_str(), realPath, shareName, volumePath, shareRoot, user == nullptr ? "" : user) != 1) {
        syslog(LOG_ERR, "%s:%d Failed to get fullpath of: %s", kSource, __LINE__, printable(path).c_str());
        return OrvLibGetErr();
    }
    if (!CheckShareUploadPrivilege(user, sid, path.c_str(), overwriteMode)) {
        syslog(LOG_ERR, "%s:%d No upload privilege to path %s", kSource, __LINE__, printable(path).c_str());
        return OrvLibGetErr();
    }
    // A switch that the kernel refused, or refused in part, counts as failed as well. Kept: 401 is answered here, not
    // stored.
    if (OrvLibUGIDSet(sid, user) != 0 || !actsAs(user)) {
        syslog(LOG_ERR, "%s:%d Failed to set UGID for user=%s, sid=%s", kSource, __LINE__, printable(user).c_str(),
               printable(sid).c_str());
        return ORV_ERR_GENERAL;
    }
    if (OrvCheckPath(realPath.c_str(), true, ORV_ACCESS_WRITE, nullptr) != 0) {
        // A look-up of permissions can fail without a code, and 0 would mean that the target is acceptable.
        if (OrvLibGetErr() == ORV_ERR_NONE) OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s:%d Invalid path:%s, reason=[%X]", kSource, __LINE__, printable(realPath).c_str(),
               static_cast<unsigned>(OrvLibGetErr()));
        return OrvLibGetErr();
    }
    return 0;
}

// Another mapping than OrvParseVexoErrToError's, and meant to be: an upload distinguishes more kinds of failure, and
// does not ask whether the share is encrypted.
int codeOfCopyError(int platformError) {
    switch (platformError) {
        case VEXO_ERR_DENIED:
            return ORV_ERR_DENIED;
        case VEXO_ERR_MISSING:
        case VEXO_ERR_BAD_PATH:
            return ORV_ERR_MISSING;
        case VEXO_ERR_EXISTS:
        case VEXO_ERR_TARGET_EXISTS:
        case VEXO_ERR_TARGET_EXISTS_OTHER:
            return ORV_ERR_EXISTS;
        case VEXO_ERR_QUOTA:
            return ORV_ERR_QUOTA;
        case VEXO_ERR_NO_SPACE:
            return ORV_ERR_NO_SPACE;
        case VEXO_ERR_READ_ONLY:
            return ORV_ERR_READ_ONLY;
        case VEXO_ERR_FILE_TOO_LARGE:
            return ORV_ERR_UPLOAD_TOO_LARGE;
        case VEXO_ERR_CANCELLED:
            return ORV_ERR_UPLOAD_CANCELLED;
        case VEXO_ERR_FAT_NAME:
            return ORV_ERR_FAT_NAME;
        case VEXO_ERR_NAME_TOO_LONG:
            return ORV_ERR_LONG_PATH;
        default:
            return ORV_ERR_GENERAL;
    }
}

bool moveFile(const char* user, const char* source, const char* target, int (*isCancelled)()) {
    if (source == nullptr || target == nullptr) return false;
    UserRecord record;
    if (VEXOUserGet(user, acquire(record)) < 0) {
        syslog(LOG_ERR, "%s (%d) Failed to get user data", kSource, __LINE__);
        return false;
    }
    const VEXOCOPYOPT options = {.uid = record->uid,
                                 .gid = record->gid,
                                 .isCancelled = isCancelled,
                                 .switches = VEXO_COPY_OVERWRITE | VEXO_COPY_TAKE | VEXO_COPY_SYNC};
    if (VEXOFileCopy(source, target, &options) == 0) return true;
    const int platformError = VLIBCErrGet();
    syslog(LOG_ERR, "%s:%d Failed to copy %s to %s, reason=[%X]", kSource, __LINE__, printable(source).c_str(),
           printable(target).c_str(), static_cast<unsigned>(platformError));
    OrvLibSetErr(codeOfCopyError(platformError));
    return false;
}

}  // namespace
}  // namespace orvel

bool IsAuthorized(WebMan& webMan, const char* appId) {
    return orvel::guardedQuietly(false, [&] { return orvel::isAuthorized(webMan, appId); });
}

int ConvUploadErrnoToAPIErr(_tag_cgi_upload_errno_ err) {
    switch (err) {
        case CGI_UPLOAD_OTHER:
            return ORV_ERR_UPLOAD_OTHER;
        case CGI_UPLOAD_QUOTA:
            return ORV_ERR_QUOTA;
        case CGI_UPLOAD_NAME_TOO_LONG:
            return ORV_ERR_LONG_PATH;
        case CGI_UPLOAD_SIZE:
            return ORV_ERR_UPLOAD_SIZE;
        case CGI_UPLOAD_FIELD:
            return ORV_ERR_UPLOAD_FIELD;
        case CGI_UPLOAD_TORN_FORM:
        case CGI_UPLOAD_BAD_FORM:
            return ORV_ERR_UPLOAD_FORM;
        case CGI_UPLOAD_MISSING:
            return ORV_ERR_MISSING;
        case CGI_UPLOAD_READ_ONLY:
            return ORV_ERR_READ_ONLY;
        case CGI_UPLOAD_NO_SPACE:
            return ORV_ERR_NO_SPACE;
        case CGI_UPLOAD_DENIED:
            return ORV_ERR_DENIED;
        case CGI_UPLOAD_MEMORY:
        case CGI_UPLOAD_INTERNAL:
        case CGI_UPLOAD_WRITE:
            break;
    }
    return ORV_ERR_GENERAL;
}

int CheckFile(std::string path, const char* user, const char* sid, _tag__type_& overwriteMode) {
    return orvel::guarded(static_cast<int>(ORV_ERR_GENERAL),
                          [&] { return orvel::checkFile(path, user, sid, overwriteMode); });
}

bool MoveFile(const char* user, const char* source, const char* target, int (*isCancelled)()) {
    return orvel::guarded(false, [&] { return orvel::moveFile(user, source, target, isCancelled); });
}
