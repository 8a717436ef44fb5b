// The platform's status record of one file.
#ifndef VEXO_STAT_H
#define VEXO_STAT_H

#include <sys/types.h>

#include <cstdint>

#include "vexo/export.h"

// Times are seconds since the epoch. The field names of times avoid the macros of <sys/stat.h>.
struct _tag_VEXOSTAT_ {
    mode_t st_mode;
    uid_t st_uid;
    gid_t st_gid;
    int64_t st_size;  // bytes
    int64_t st_access;
    int64_t st_modify;
    int64_t st_change;
    int64_t st_create;   // filled with flag 8 only
    uint64_t st_device;  // major and minor as makedev() joins them
    uint64_t st_inode;
    uint32_t st_links;
    uint32_t st_attributes;  // VEXO_ATTRIBUTE_... bits
};

enum { VEXO_STAT_BASIC = 1, VEXO_STAT_CREATE_TIME = 8 };

// What decides about writing and removing besides mode and owner. Without KNOWN the file system does not say, or the
// entry is the root of another mount.
enum { VEXO_ATTRIBUTE_KNOWN = 1, VEXO_ATTRIBUTE_IMMUTABLE = 2, VEXO_ATTRIBUTE_APPEND = 4 };

VEXO_BEGIN_C
// The status of `path` itself (a symbolic link is not followed). `flags`: 1 basic fields, 8 also the creation time (the
// smaller of mtime and ctime where the file system keeps none). 0, or <0 with errno and the slot set (0x0600 missing,
// 0x0300 denied, 0x8100 else); the record is zero then.
VEXO_API int VLIBCFileLStat(const char* path, unsigned flags, _tag_VEXOSTAT_* status);
// The same for `name` inside the open folder `dirfd`: what a walk or listing of many entries calls.
VEXO_API int VLIBCFileLStatAt(int dirfd, const char* name, unsigned flags, _tag_VEXOSTAT_* status);
VEXO_END_C

#endif
