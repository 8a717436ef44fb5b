// The folders for temporary files that every volume has: "@tmp", "@tmp/orvel" and "@tmp/orvel/PXSearch". A volume is
// the first component of a share's root, or that root itself where it has no second one.
#ifndef VEXO_VOLUME_H
#define VEXO_VOLUME_H

#include "vexo/export.h"

struct VEXOVOLUMENOTE {
    const char* volume;
    int error;           // errno; 0 when its folders are there
    const char* folder;  // where it stopped; "" when they are there
};

VEXO_BEGIN_C
// Makes them on every volume of the shares, root's and everybody's to write in but not to remove from (01777), or gives
// those that are there and root's this mode. Neither a link nor what belongs to somebody else is used, and volumes on
// network mounts are left out: who first needs the folders there makes them. To be called as root, when the machine
// starts and when the definitions changed. Each volume is handed to `take`, which may be null. 0 when all are well;
// else -1 with errno of the last failure, and with EPERM at once without the right to act as root.
VEXO_API int VEXOVolumesPrepare(void (*take)(const VEXOVOLUMENOTE*, void*), void* argument);

// The same for the volumes of the shares and the home as `user` has them, and below PXSearch on each a folder of the
// user's own, 0700: for a log-in; every session that begins has called it. 0x1D00 for a user who is unknown.
VEXO_API int VEXOVolumesPrepareFor(const char* user, void (*take)(const VEXOVOLUMENOTE*, void*), void* argument);
VEXO_END_C

#endif
