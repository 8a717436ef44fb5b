// File systems, mounts and folders of the appliance.
#ifndef VEXO_FILESYSTEM_H
#define VEXO_FILESYSTEM_H

#include <sys/types.h>

#include <string>
#include <vector>

#include "vexo/export.h"

// Numbers of file-system types: a position in rgszFsType, or one of the two below.
enum {
    VEXO_FS_FAT = 1,
    VEXO_FS_NOT_A_MOUNT = 10,
    VEXO_FS_UNKNOWN = 11,
};

// Kinds of a volume: the two external ones stand in the volumes file /etc/vexo/volumes (`/path kind`).
enum { VEXO_VOLUME_INTERNAL = 1, VEXO_VOLUME_USB = 4, VEXO_VOLUME_ESATA = 8 };

struct VOLUMEPATHINFO {
    int kind;
    char szVolume[4096];  // the first component of the path ("/volume1")
};

VEXO_BEGIN_C

// Type names by number: 0 to 3 disks, 4 and 5 disc images, 6 to 8 network.
extern VEXO_API const char rgszFsType[9][10];

// The mount table is /proc/mounts of the system root, or the machine's own where the root has none.

// The type of the file system that holds `path`: that of the longest mount point which is a prefix of it; 11 unknown
// type, -1 with errno when the path is null (EINVAL) or the table cannot be read. `flags` is 0.
VEXO_API int VEXOGetFSType(const char* path, int flags);
// Position of the mount-table entry whose mount point is `path` (trailing slashes do not count; later mounts win), -1
// when there is none. Reads the table alone, never the file system: the server behind a mount may be dead.
VEXO_API int VEXOFSIsInMountTable(const char* path);
VEXO_API int VEXOFSIsImageFS(int type);  // 1 for types 4 and 5, else 0
// 1 when a network mount lies somewhere below the folder, else 0. By the mount table alone, too.
VEXO_API int VEXOFSHasRemoteBelow(const char* path);

// What a file or folder is called until it is whole: this and anything behind it.
#define VEXO_PART_PREFIX ".vexo-part-"

// Names that the file manager never shows. Dir: "@vexoea", the folder of extended attributes. File: that, ".", "..",
// "@tmp" and what begins with VEXO_PART_PREFIX. Exactly 1 or 0.
VEXO_API int VEXOEAIsHiddenDir(const char* name);
VEXO_API int VEXOEAIsHiddenFile(const char* name);

// The volume of an absolute path. >0, or <=0 with 0x0D00 for one that is null or not absolute.
VEXO_API int VolumePathParse(const char* path, VOLUMEPATHINFO* info);

// Creates `path` and, when `recursive`, its missing parents, mode and owner set on the folders that it made alone (an
// owner of -1 keeps the caller), each before it bears its name. Folders above the users' homes, the root of the share
// "homes" and "@DOMAIN" in it, stay the caller's instead, 0755; an "@DOMAIN" that belongs to `uid` is given back to
// root. No symbolic link is followed on the part that it makes. 0 (even if the folder exists); <0 with errno and the
// slot, and in `*stopAt` (may be null) the component where it stopped, inside `path`.
VEXO_API int VEXOFSMkdirP(const char* path, const char** stopAt, int recursive, uid_t uid, gid_t gid, mode_t mode);

VEXO_END_C

// 1 when the mount found by the last VEXOFSIsInMountTable (types 6 to 8 in the second form) is a network one, else 0.
VEXO_API int VEXOFSIsRemoteFS();
VEXO_API int VEXOFSIsRemoteFS(int type);

namespace WebUtils {

VEXO_API bool IsMountPoint(std::string path);         // by the mount table
VEXO_API std::string getMountType(std::string path);  // type name of the mount at exactly `path`; "" when there is none
// Seconds since the epoch in decimal; "0" when it cannot be read. The path is taken as it stands: that of an
// appliance's folder goes through VEXO::SystemPath first.
VEXO_API std::string GetModifyTime(const char* path);
VEXO_API std::vector<std::string> StringExplode(const std::string& text,
                                                const std::string& delimiter);  // no empty pieces

}  // namespace WebUtils

#endif
