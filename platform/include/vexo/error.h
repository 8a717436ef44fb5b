/* The platform's error slot: one {code, file, line} a process, the last failure wins.
 *
 * Rules that hold for every operation of the platform:
 *  - a failing operation fills the slot and leaves `errno` as it was at its failure (log lines use it);
 *  - success leaves the slot alone, so it is read only after a reported failure;
 *  - names and paths are bytes: any but "/" and NUL, in any encoding;
 *  - operations on a central store raise to the saved uid 0 for themselves alone and go back on every path. */
#ifndef VEXO_ERROR_H
#define VEXO_ERROR_H

#include "vexo/export.h"

enum {
    VEXO_ERR_DENIED = 0x0300,
    VEXO_ERR_MISSING = 0x0600,
    VEXO_ERR_BAD_PATH = 0x0700,
    VEXO_ERR_EXISTS = 0x0800,
    VEXO_ERR_FILE = 0x0900, /* a file is missing or cannot be opened */
    VEXO_ERR_PARAMETER = 0x0D00,
    VEXO_ERR_REMOTE_MOUNT = 0x1100,
    VEXO_ERR_SHARE_MISSING = 0x1400,
    VEXO_ERR_USER_MISSING = 0x1D00,
    VEXO_ERR_QUOTA = 0x2400,
    VEXO_ERR_TMP_NO_SPACE = 0x2500,
    VEXO_ERR_NO_SPACE = 0x2900,
    VEXO_ERR_PATH = 0x8000, /* a path could not be resolved, a walk failed */
    VEXO_ERR_GENERAL = 0x8100,
    VEXO_ERR_READ_ONLY = 0x8400,
    VEXO_ERR_TARGET_EXISTS = 0xA000,
    VEXO_ERR_TARGET_EXISTS_OTHER = 0xA200, /* the target exists as another type */
    VEXO_ERR_FILE_TOO_LARGE = 0xA300,
    VEXO_ERR_CANCELLED = 0xA400,
    VEXO_ERR_FAT_NAME = 0xA500,
    VEXO_ERR_PATH_MISSING = 0xBE00,
    VEXO_ERR_NAME_TOO_LONG = 0xC300,
    VEXO_ERR_ACL_TARGET_MISSING = 0xD700,
    VEXO_ERR_NO_ACL = 0xD800
};

VEXO_BEGIN_C
/* Fills the slot. `file` must be a string that lives as long as the process (a literal); null counts as "". */
VEXO_API void VLIBCErrSetEx(int code, const char* file, int line);
/* The code last stored; 0 before the first failure. */
VEXO_API int VLIBCErrGet(void);
/* Where the last failure was stored; "" and 0 before the first. Never null. */
VEXO_API const char* VLIBCErrorGetFile(void);
VEXO_API int VLIBCErrorGetLine(void);
VEXO_END_C

#endif
