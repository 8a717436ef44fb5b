// One listed entry, a file, folder or share, and the choice of its optional properties.
#ifndef ORVEL_DIR_ENTRY_H
#define ORVEL_DIR_ENTRY_H

#include <cstdint>
#include <string>

// The "additional" bit set: which optional properties a listing fills and the JSON writer emits.
enum {
    ADDITIONAL_REAL_PATH = 0x01,
    ADDITIONAL_SIZE = 0x02,
    ADDITIONAL_OWNER = 0x04,             // uid, owner, gid, group
    ADDITIONAL_TIME = 0x08,              // mtime, ctime, crtime, atime
    ADDITIONAL_PERM = 0x10,              // mode, aclPrivilege, isAclMode; of shares also their three privilege fields
    ADDITIONAL_TYPE = 0x20,              // type
    ADDITIONAL_MOUNT_POINT_TYPE = 0x40,  // mountPointType
    ADDITIONAL_VOLUME_STATUS = 0x80,     // freeSpace, totalSpace, readOnly; share listing only
    ADDITIONAL_SYNC_SHARE = 0x100        // syncedShare; share listing only
};

// Which entries a listing keeps. Any other value means all.
enum _tag_dir_entry_type_ : int { DIR_ENTRY_TYPE_DIR = 0, DIR_ENTRY_TYPE_FILE = 1, DIR_ENTRY_TYPE_ALL = 2 };

// Strings are bytes as the file system has them; what was not asked for stays empty or 0. Times are seconds since the
// epoch, unsigned, cut to 32 bits.
struct DIRENTRY_INFO {
    std::string name;
    std::string path;           // share-relative
    std::string realPath;       // on this machine
    std::string type;           // the extension in upper case; files only
    int64_t size = 0;           // bytes
    uint32_t mode = 0;          // st_mode
    uint32_t aclPrivilege = 0;  // what GetACLPrivilege answers
    int32_t isAclMode = 0;      // 1 when the file system keeps ACLs
    uint32_t mtime = 0;
    uint32_t ctime = 0;
    uint32_t crtime = 0;  // creation
    uint32_t atime = 0;
    uint32_t uid = 0;
    std::string owner;  // "" for an unknown uid
    uint32_t gid = 0;
    std::string group;  // "" for an unknown gid
    bool isDirectory = false;
    std::string mountPointType;  // "", "iso", "remote", or "remotefail" for a server that does not answer

    // Filled by the share listing only.
    uint32_t shareAccessRight = 4;  // the user's right: 0 none, 1 read, 2 read-write; 4 not asked
    uint32_t ftpPrivilege = 0;
    bool aclEnabled = false;
    bool syncedShare = false;  // replicated to another appliance
    uint64_t freeSpace = 0;    // bytes
    uint64_t totalSpace = 0;   // bytes
    bool readOnly = false;
    std::string shareExtra;
};

#endif
