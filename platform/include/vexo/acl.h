// What the calling identity may do with a file.
#ifndef VEXO_ACL_H
#define VEXO_ACL_H

#include "vexo/export.h"
#include "vexo/stat.h"

enum {
    VEXO_ACL_EXECUTE = 0x1,
    VEXO_ACL_WRITE = 0x2,
    VEXO_ACL_READ = 0x4,
    VEXO_ACL_APPEND = 0x8,
    VEXO_ACL_DELETE = 0x200
};

VEXO_BEGIN_C
// The bits that the effective identity holds on `path` (symbolic links are followed), as the kernel judges: R gives
// 0x4, W gives 0x2 and 0x8, X gives 0x1; 0x200 when the parent folder lets it be removed (W and X there, and the sticky
// rule). 0, or <0 with the slot: 0x0600 or 0xD700 missing, 0x8100 else. A denial is no failure: the bits are missing
// then.
VEXO_API int VEXOACLPermGet(const char* path, unsigned* permission);
// The same for the entries of one open folder whose status the caller has at hand (`status` of the entry itself, no
// link followed): what a listing calls. The kernel is asked only where the status does not settle the answer. Open
// collects once what holds for all entries (the effective identity, the mount, the folder's own bits), so it is opened
// after the switch of identity and lives no longer than the listing. `dirfd` stays the caller's and open. Null with the
// slot (0x8100) on failure.
typedef struct VEXOACLFOLDER* PVEXOACLFOLDER;
VEXO_API PVEXOACLFOLDER VEXOACLFolderOpen(int dirfd);
VEXO_API int VEXOACLFolderPermGet(PVEXOACLFOLDER folder, const char* name, const _tag_VEXOSTAT_* status,
                                  unsigned* permission);
VEXO_API void VEXOACLFolderClose(PVEXOACLFOLDER folder);  // null is accepted

// >0 when the file system that holds `path` keeps ACLs, 0 when not, <0 failure. Remembered per device. Pass -1 and 2.
VEXO_API int VEXOACLIsSupport(const char* path, int fd, int kind);
// The same for the device of an entry whose status is known; `path` is used when the device is met for the first time.
VEXO_API int VEXOACLIsSupportOnDevice(const char* path, unsigned long long device);
VEXO_END_C

#endif
