#include "orvel/error_state.h"

#include <cerrno>
#include <string>

#include "core/boundary.h"
#include "orvel/share_path.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"

namespace {

int lastError = ORV_ERR_NONE;

// A name that is too long. Encrypted shares allow shorter names, so they have a code of their own. A share that cannot
// be read counts as not encrypted; the 408 that asking leaves behind is meant, the caller stores this result over it.
int longPathError(const char* shareName) {
    if (shareName == nullptr) return ORV_ERR_LONG_PATH;
    bool encrypted = false;
    if (OrvLibCheckEncryptShare(shareName, &encrypted) != 0 && encrypted) return ORV_ERR_ENCRYPTED_LONG_PATH;
    return ORV_ERR_LONG_PATH;
}

int busyError(const char* mountPath) {
    const bool isMount = mountPath != nullptr && VEXOFSIsInMountTable(mountPath) != -1;
    return isMount ? ORV_ERR_MOUNT_BUSY : ORV_ERR_BUSY;
}

struct CodeKey {
    int code;
    const char* key;
};

constexpr const char* kSystemKey = "error:error_error_system";

constexpr CodeKey kKeys[] = {
    {ORV_ERR_PARAMETER, kSystemKey},
    {ORV_ERR_GENERAL, kSystemKey},
    {ORV_ERR_DIRECTORY, kSystemKey},
    {ORV_ERR_USER, "error:error_invalid_user_group"},
    {ORV_ERR_GROUP, "error:error_invalid_user_group"},
    {ORV_ERR_USER_GROUP, "error:error_invalid_user_group"},
    {ORV_ERR_SERVER, "error:error_testjoin"},
    {ORV_ERR_DENIED, "error:error_privilege_not_enough"},
    {ORV_ERR_MISSING, "error:error_no_path"},
    {ORV_ERR_DENIED_OTHER, "error:error_privilege_not_enough"},
    {ORV_ERR_REMOTE, "error:conn_rv_fail"},
    {ORV_ERR_READ_ONLY, "error:error_fs_ro"},
    {ORV_ERR_LONG_PATH, "error:error_long_path"},
    {ORV_ERR_ENCRYPTED_LONG_PATH, "error:error_encryption_long_path"},
    {ORV_ERR_EXISTS, "error:error_file_exist"},
    {ORV_ERR_QUOTA, "error:error_quota_not_enough"},
    {ORV_ERR_NO_SPACE, "error:error_space_not_enough"},
    {ORV_ERR_IO, "error:error_io"},
    {ORV_ERR_RESERVED_NAME, "error:error_reserved_name"},
    {ORV_ERR_FAT_NAME, "error:error_fat_reserved_name"},
    {ORV_ERR_BUSY, kSystemKey},
    {ORV_ERR_MOUNT_BUSY, "error:error_folder_busy"},
    {ORV_ERR_OVERWRITE, "error:error_overwrite_fail"},
    {ORV_ERR_SELECT_CONFLICT, "error:error_select_conflict"},
    {ORV_ERR_ILLEGAL_NAME, "error:mvcp_filename_illegal"},
    {ORV_ERR_FILE_TOO_BIG, "error:mvcp_file_too_big"},
    {ORV_ERR_EXTRACT, kSystemKey},
    {ORV_ERR_ARCHIVE, "error:error_invalid_archive"},
    {ORV_ERR_ARCHIVE_DATA, "error:error_invalid_archive_data"},
    {ORV_ERR_ARCHIVE_PASSWORD, "error:extract_passwd_missing"},
    {ORV_ERR_EXTRACT_OTHER, kSystemKey},
    {ORV_ERR_COMPRESS, kSystemKey},
};

int errnoToCode(int err, const char* shareName, const char* mountPath) {
    switch (err) {
        case EPERM:
        case EACCES:
            return ORV_ERR_DENIED;
        case ENOENT:
        case ENOTDIR:
            return ORV_ERR_MISSING;
        case EIO:
            return ORV_ERR_IO;
        case EBUSY:
            return busyError(mountPath);
        case EEXIST:
        case ENOTEMPTY:
            return ORV_ERR_EXISTS;
        case ENOSPC:
            return ORV_ERR_NO_SPACE;
        case EROFS:
            return ORV_ERR_READ_ONLY;
        case ENAMETOOLONG:
            return longPathError(shareName);
        case EDQUOT:
            return ORV_ERR_QUOTA;
        default:
            return ORV_ERR_GENERAL;
    }
}

int platformErrorToCode(int vexoErr, const char* shareName) {
    switch (vexoErr) {
        case VEXO_ERR_DENIED:
            return ORV_ERR_DENIED;
        case VEXO_ERR_MISSING:
        case VEXO_ERR_BAD_PATH:
            return ORV_ERR_MISSING;
        case VEXO_ERR_QUOTA:
            return ORV_ERR_QUOTA;
        case VEXO_ERR_NO_SPACE:
            return ORV_ERR_NO_SPACE;
        case VEXO_ERR_READ_ONLY:
            return ORV_ERR_READ_ONLY;
        case VEXO_ERR_FAT_NAME:
            return ORV_ERR_FAT_NAME;
        case VEXO_ERR_NAME_TOO_LONG:
            return longPathError(shareName);
        default:
            return ORV_ERR_GENERAL;
    }
}

}  // namespace

int OrvLibSetErr(int code) {
    return lastError = code;
}

int OrvLibGetErr(void) {
    return lastError;
}

const char* OrvParseErrorToKTRString(int code, const char* defaultKey) {
    for (const CodeKey& entry : kKeys) {
        if (entry.code == code) return entry.key;
    }
    return defaultKey != nullptr ? defaultKey : kSystemKey;
}

int OrvParseErrnoToError(int err, const char* shareName, const char* mountPath) {
    return orvel::guardedQuietly<int>(ORV_ERR_GENERAL, [&] { return errnoToCode(err, shareName, mountPath); });
}

int OrvParseVexoErrToError(int vexoErr, const char* shareName) {
    return orvel::guardedQuietly<int>(ORV_ERR_GENERAL, [&] { return platformErrorToCode(vexoErr, shareName); });
}
