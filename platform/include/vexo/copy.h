// Copying one file.
#ifndef VEXO_COPY_H
#define VEXO_COPY_H

#include <sys/stat.h>
#include <sys/types.h>

#include "vexo/export.h"

enum {
    VEXO_COPY_OVERWRITE = 0x1,   // an existing file at the target is replaced
    VEXO_COPY_KEEP_TIMES = 0x2,  // the copy takes over the times of access and modification
    VEXO_COPY_TAKE = 0x4,        // the source is the caller's to give: on one file system it becomes the target itself
    VEXO_COPY_KEEP_MODE = 0x8,   // a new file has the source's permission bits, without set-id and sticky bits
    VEXO_COPY_SYNC = 0x10,       // the data is on the disk before the target has its name
};

struct VEXOCOPYOPT {
    uid_t uid;             // owner of the copy; -1 leaves the caller's
    gid_t gid;             // the same for the group
    int (*isCancelled)();  // asked before each piece of at most 4 MiB, nonzero ends the copy; null: never
    unsigned switches;     // VEXO_COPY_... bits
};

VEXO_BEGIN_C
// Copies the regular file `source` to `target`, both paths of at most 4,095 bytes, with the caller's effective
// identity. `options` may be null: the caller's own file, never cancelled, no switches.
//
// The target appears whole or not at all: the data goes to a file beside it, nameless or hidden (VEXOEAIsHiddenFile),
// which takes its place in one step. What replaces a file is on the disk before that; whether the name is, the caller
// sees to. A new file gets what VEXOShareGiveNew gives (with KEEP_MODE, which does not bear on TAKE, the source's mode
// is wanted), or what the folder's default ACL says; one that replaces another takes over that one's permissions (its
// ACL too), not its owner. Holes of the source stay holes; data is shared with the source where the file system can.
// With TAKE, a source that the caller owns, that has one name and lies on the target's file system is not copied but
// becomes the target, and its old name is gone; any other source is copied and stays. A failure may leave a source that
// was to be taken with the target's owner and permissions.
//
// 0, or -1 with errno and the slot, the target as it was and nothing beside it: 0x0600 the source or the target's
// folder is missing, 0x0700 a path is no path of a file (the source is a folder, link, pipe...; the target has no
// name), 0x0300 denied, 0x0800 source and target are one file, 0xA000 a file is at the target already and is not to be
// replaced, 0xA200 something other than a file is there, 0xC300 the name is too long, 0xA500 the target's file system
// is FAT and cannot hold the name, 0xA300 nor a file of this size, 0x2900 no space, 0x2400 quota, 0x8400 read-only file
// system, 0xA400 cancelled, 0x0D00 a null or empty path, 0x8100 else (the source shrank or could not be read).
VEXO_API int VEXOFileCopy(const char* source, const char* target, const struct VEXOCOPYOPT* options);

// Copies in the place of the file that `isExpected` accepts, and of no other: `old` is what is at the target, `fresh`
// what replaces it, `of` what was handed in. It is asked before, and once more of what the copy took the place of when
// nobody finds that under its name any more: if that is another file, or was written meanwhile, it gets its name back,
// so that nobody's change is lost. On a file system that cannot exchange two names it is asked right before the
// replacing.
//
// As above with OVERWRITE, and with 0xA000 when the target is not that file: errno is ESTALE for another one or none,
// ETXTBSY where somebody has it open for writing (known of the caller's own files, where the file system says so).
VEXO_API int VEXOFileReplace(const char* source, const char* target, const struct VEXOCOPYOPT* options,
                             int (*isExpected)(const struct stat* old, const struct stat* fresh, void* of), void* of);

// The bytes of the source that the copy under way has behind it, holes included: for isCancelled to report how far it
// is. After the copy, what it came to.
VEXO_API long long VEXOFileCopyDone(void);
VEXO_END_C

#endif
