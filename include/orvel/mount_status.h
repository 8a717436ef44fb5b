// Which file system is mounted at a folder, and whether a path lies on a read-only mount, for the time of one listing.
#ifndef ORVEL_MOUNT_STATUS_H
#define ORVEL_MOUNT_STATUS_H

#include <map>
#include <string>

#include "orvel/export.h"

// The status of one mount.
struct MOUNT_STATUS {
    int fsType;     // position in the platform's table rgszFsType (0 to 8), 11 for any other type
    bool readOnly;  // mounted with "ro"
};

// Reads the mount table on first use and answers from that copy: mounts and unmounts after it are not seen.
class ORVEL_API OrvelMountStatus {
 public:
    OrvelMountStatus();
    ~OrvelMountStatus();

    // Adds the mount table's entries to the copy; of several mounts on one folder the first one read stays. False with
    // platform error 0x0900 when the table cannot be read. Does not mark the copy as complete: only getFSTYPE does.
    bool GetMountStatus();

    // The type of the file system mounted exactly at `path` (trailing slashes do not count): 0 to 8 or 11 as above, 10
    // when nothing is mounted there, 11 when the table cannot be read (platform error 0x0900). A null path counts as
    // "". Logs nothing.
    int getFSTYPE(const char* path);

    // Whether the mount that holds `path` is read-only: the deepest mount point that is `path` or a folder above it
    // decides. False when there is none, for a null path and (platform error 0x0900) when the table cannot be read. The
    // root mount is never counted as holding a path below it. Logs nothing.
    bool IsReadOnly(const char* path);

 private:
    std::map<std::string, MOUNT_STATUS> mounts_;  // by mount point, in byte order
    bool loaded_ = false;
};

#endif
