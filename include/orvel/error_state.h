/* The library error code: one integer a process that says why an exported function failed.
 *
 * Nothing resets it implicitly: a caller reads it only after a reported failure. Usable from C. */
#ifndef ORVEL_ERROR_STATE_H
#define ORVEL_ERROR_STATE_H

#include "orvel/export.h"

enum {
    ORV_ERR_NONE = 0,
    ORV_ERR_PARAMETER = 400,    /* a required argument is null or empty */
    ORV_ERR_GENERAL = 401,      /* anything without a code of its own */
    ORV_ERR_DIRECTORY = 402,    /* a directory cannot be entered or opened; a privilege service failed */
    ORV_ERR_USER = 403,         /* unknown user */
    ORV_ERR_GROUP = 404,        /* unknown group */
    ORV_ERR_USER_GROUP = 405,   /* never set here, mapped only */
    ORV_ERR_SERVER = 406,       /* the domain or directory server could not be reached */
    ORV_ERR_DENIED = 407,       /* permission denied */
    ORV_ERR_MISSING = 408,      /* the path or share does not exist */
    ORV_ERR_DENIED_OTHER = 409, /* never set here, mapped only */
    ORV_ERR_REMOTE = 410,       /* the path lies on a network mount */
    ORV_ERR_READ_ONLY = 411,    /* read-only file system */
    ORV_ERR_LONG_PATH = 412,
    ORV_ERR_ENCRYPTED_LONG_PATH = 413, /* too long for an encrypted share */
    ORV_ERR_EXISTS = 414,
    ORV_ERR_QUOTA = 415,
    ORV_ERR_NO_SPACE = 416,
    ORV_ERR_IO = 417,
    ORV_ERR_RESERVED_NAME = 418,
    ORV_ERR_FAT_NAME = 419,
    ORV_ERR_BUSY = 420,
    ORV_ERR_MOUNT_BUSY = 421, /* busy because it is a mount point */

    /* Set by the programs for their own operations; the library only maps them to keys. */
    ORV_ERR_OVERWRITE = 1004,
    ORV_ERR_SELECT_CONFLICT = 1005,
    ORV_ERR_ILLEGAL_NAME = 1006,
    ORV_ERR_FILE_TOO_BIG = 1007,
    ORV_ERR_EXTRACT = 1400,
    ORV_ERR_ARCHIVE = 1401,
    ORV_ERR_ARCHIVE_DATA = 1402,
    ORV_ERR_ARCHIVE_PASSWORD = 1403,
    ORV_ERR_EXTRACT_OTHER = 1404,
    ORV_ERR_COMPRESS = 1405,

    /* Failures of an upload; no message keys of their own. */
    ORV_ERR_UPLOAD_FORM = 1800,
    ORV_ERR_UPLOAD_FIELD = 1801,
    ORV_ERR_UPLOAD_SIZE = 1802,
    ORV_ERR_UPLOAD_OTHER = 1803,
    ORV_ERR_UPLOAD_CANCELLED = 1804,
    ORV_ERR_UPLOAD_TOO_LARGE = 1805
};

#ifdef __cplusplus
extern "C" {
#endif

/* Stores `code` (any value) and returns it, so that a caller can set and return in one statement. */
ORVEL_API int OrvLibSetErr(int code);

/* The code last stored; 0 when the library has just been loaded. */
ORVEL_API int OrvLibGetErr(void);

/* The message key of `code`, "section:entry" of the browser's string tables. A code without a key of its own gives
 * `defaultKey`, or "error:error_error_system" when that is null; a code with one never consults `defaultKey`. The
 * result is static (or `defaultKey` itself) and never freed. Reads and changes no state. */
ORVEL_API const char* OrvParseErrorToKTRString(int code, const char* defaultKey);

/* The library code for an errno value; it is not stored. `shareName` (may be null) decides whether a name that is too
 * long gives 413 (encrypted share) or 412, `mountPath` (may be null) whether EBUSY gives 421 (a mount point) or 420.
 * Side effect: asking about a share that cannot be read stores 408. */
ORVEL_API int OrvParseErrnoToError(int err, const char* shareName, const char* mountPath);

/* The library code for a platform error number; it is not stored. `shareName` as above. */
ORVEL_API int OrvParseVexoErrToError(int vexoErr, const char* shareName);

#ifdef __cplusplus
}
#endif

#endif
