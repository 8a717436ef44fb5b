// Walks of folder trees, and the sub-folders of one folder.
//
// A walk carries two paths side by side: the display path (how the caller wants to report entries) and the real path
// (where they lie). Both grow by "/" and the entry name at each level. Paths and names are bytes; a tree may be deeper
// than the longest path that the kernel takes, and a walk keeps few descriptors open at any depth.
#ifndef ORVEL_DIRECTORY_WALKER_H
#define ORVEL_DIRECTORY_WALKER_H

#include <cstdint>
#include <string>
#include <vector>

#include "orvel/export.h"
#include "vexo/stat.h"

// Which failures of entering, opening or reading a folder, or of an entry's status, are passed over silently; the
// others are logged and end the walk. Any other value behaves like ENUM_IGNORE_NO_ERR.
enum _enum_ignore_err_ : int {
    ENUM_IGNORE_PERMISSION_ERR = 0,  // EACCES and EPERM
    ENUM_IGNORE_ALL_ERR = 1,
    ENUM_IGNORE_NO_ERR = 2
};

// What a walk calls for each entry.
class ORVEL_API OrvDirectoryWalkerCallBack {
 public:
    // `displayPath`, `realPath`: of the entry; `name`: its last component; `status`: its status, a link's own, with the
    // creation time; `context`, `extra`: as given to the walk. All references hold for the call alone. False ends the
    // walk.
    virtual bool operator()(const std::string& displayPath, const std::string& context, const std::string& realPath,
                            const std::string& name, _tag_VEXOSTAT_& status, const std::string* extra) = 0;
    virtual ~OrvDirectoryWalkerCallBack();
};

// Common to the three walks: entries come in the order in which the file system delivers them, hidden names left out; a
// symbolic link is reported and never followed, even if it takes a folder's place during the walk (the starting folder
// itself may be reached through links, and "/proc/self/fd/N" stands for one that the caller holds open: the real path
// is then where it lies). Another folder that takes a folder's place is walked instead of it. `skipRecycle` leaves out
// a share's recycle bin directly in the starting folder. The folder's names are read before its entries are handled.
//
// True when the walk came to its end, or was cancelled by the abort flag; false when a callback returned false or a
// failure was not to be ignored (logged), or memory ran out. No library code is set. Side effect: the current directory
// becomes each folder entered, and stays in the last one.
class ORVEL_API OrvDirectoryWalker {
 public:
    // `abortFlag`: may be null; read before each entry, 1 (no other value) cancels the walk.
    OrvDirectoryWalker(_enum_ignore_err_ mode, int* abortFlag);

    // Depth first; `before` is called ahead of an entry's subtree, `after` behind it, both for every entry. Either may
    // be null.
    bool Walk(const std::string& displayPath, const std::string& context, const std::string& realPath,
              OrvDirectoryWalkerCallBack* before, OrvDirectoryWalkerCallBack* after, const std::string* extra,
              bool skipRecycle);

    // Depth first; each entry ahead of its subtree.
    bool Walk_TopDown(const std::string& displayPath, const std::string& context, const std::string& realPath,
                      OrvDirectoryWalkerCallBack& callback, const std::string* extra, bool skipRecycle);

    // Every entry of the starting folder first, then, unless `firstFolderOnly`, each of its folders as Walk_TopDown
    // does.
    bool Walk_FirstFolder_First(const std::string& displayPath, const std::string& context, const std::string& realPath,
                                OrvDirectoryWalkerCallBack& callback, const std::string* extra, bool skipRecycle,
                                bool firstFolderOnly);

 private:
    _enum_ignore_err_ mode_;
    int* abortFlag_;
};

// One sub-folder.
struct _tag_SUBDIR_ENTRY_INFO_ {
    std::string name;
    std::string path;  // real path
    int64_t size;
    uint32_t mode;
    int32_t mtime;  // seconds since the epoch
    uint32_t uid;
    uint32_t gid;
    bool isMountPoint;
    std::string mountType;  // file-system type of a mount point, "" for an ordinary folder, "remotefail" for a network
                            // mount that does not answer (all numbers are 0 then)
};

// Appends the sub-folders of `realPath` ("/proc/self/fd/N": of a folder that the caller holds open, whose real path is
// where it lies) to `subDirs`, hidden ones left out, and sorts the whole vector by name without
// case; names that differ only in case stand in no defined order. A sub-folder whose status cannot be read is left out,
// unless it is a network mount.
//
// True with the library code 0; false with 400 (empty path, logged), 408 (missing or no folder), 407 (denied) or 402
// (anything else, including a folder that fails half-way through); `subDirs` is unchanged then. Side effect: the
// current directory becomes the folder.
ORVEL_API bool OrvLibEnumSubDir(std::string realPath, std::vector<_tag_SUBDIR_ENTRY_INFO_>& subDirs);

#endif
