// The files of a share as smb.conf wants them: which names it keeps out, what new ones get, where its recycle bin is.
#ifndef VEXO_SHARE_FILES_H
#define VEXO_SHARE_FILES_H

#include <sys/types.h>

#include "vexo/export.h"

VEXO_BEGIN_C
// Says in which folder, open (O_PATH will do) or by its real path, the names lie that VEXOEAIsHiddenFile is asked about
// next: it hides the veto files of every share that this folder lies in, too. Costs nothing where no share has any.
VEXO_API void VEXOShareNamesOf(int folder);
VEXO_API void VEXOShareNamesAt(const char* realPath);
// 1 for a name that the share keeps out there, 0 for one that is hidden for another reason or not at all.
VEXO_API int VEXOShareVetoes(const char* name);
// To this process's end the recycle bin of the share or home with this root is hidden with them: for whoever is to see
// what it holds, but not what was deleted from it. 0, or -1 with errno and the slot, and nothing is hidden.
VEXO_API int VEXOShareHideBin(const char* root);

enum {
    VEXO_NEW_OWN_MODE = 0x1,  // the mode is that of something else, so that only what the share states changes it
};
// Gives `made`, a file or folder that this process just made in the open folder `folder`, its owner, group and mode, as
// the innermost share that holds the folder says (create mask and directory mask, their force modes, force group,
// inherit permissions; a folder's default ACL and set-group bit before them). Either may be open for its
// path only. `mode`: what is wanted; new things of an unnamed share get 0644 and 0755 at most. `uid`, `gid`: -1 keeps
// them. File systems without owners and modes are not a failure. 0, or -1 with errno and the slot.
VEXO_API int VEXOShareGiveNew(int folder, int made, mode_t mode, unsigned switches, uid_t uid, gid_t gid);

// The path of the recycle bin within the share whose root is `root`: "#recycle", or where the share has Samba's module
// of that name what recycle:repository says for the user of this request. 0, or -1 with errno and the slot.
VEXO_API int VEXOShareRecyclePath(const char* root, char* path, int size);

enum {
    VEXO_SNAPSHOTS_STATED = 0x1,      // the share says where they are; else the members below are not to be used
    VEXO_SNAPSHOTS_NONE = 0x2,        // it says that there are none, or where in a way that is not known here
    VEXO_SNAPSHOTS_LOCAL_TIME = 0x4,  // their names are in the machine's time zone, not in UTC
    VEXO_SNAPSHOTS_EVERYWHERE = 0x8   // `folder` may lie in any folder of the share, of which its snapshots then are
};
struct VEXOSNAPSHOTS {
    unsigned flags;     // VEXO_SNAPSHOTS_...
    char folder[4096];  // that holds them: absolute, or below the mount point
    char format[256];   // of their names, as of strptime(3)
    char base[4096];    // the folder that each is a snapshot of, "" for the mount point
    char mount[4096];   // the mount point, "" where it is to be found
    char inside[4096];  // the share's root in a snapshot, "" where it lies as below `base`
};
typedef VEXOSNAPSHOTS* PVEXOSNAPSHOTS;
// Where the snapshots of the share whose root is `root` are, as the options of Samba's shadow_copy2 say (shadow:snapdir
// and the like). 0, or -1 with errno and the slot.
VEXO_API int VEXOShareSnapshots(const char* root, PVEXOSNAPSHOTS snapshots);
// To this process's end, names in `folder` (a real path) and below are those of `realPath`: what a share keeps out of
// that one is kept out of its snapshot. A further call replaces the one before.
VEXO_API void VEXOShareStandsFor(const char* folder, const char* realPath);
VEXO_END_C

#endif
