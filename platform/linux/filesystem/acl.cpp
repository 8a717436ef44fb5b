// What the effective identity may do with a file, as the kernel judges.
#include "vexo/acl.h"

#include <fcntl.h>
#include <linux/capability.h>
#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <exception>
#include <string>

#include "failure.h"
#include "fault_gate.h"
#include "filesystem/acl_rules.h"
#include "filesystem/status.h"

struct VEXOACLFOLDER {
    int dirfd;
    vexo::Identity who;
    vexo::FolderFacts facts;
};

namespace {

using vexo::FolderFacts;
using vexo::Identity;

constexpr int kXfsMagic = 0x58465342;  // not in <linux/magic.h>

Identity currentIdentity() {
    Identity who{geteuid(), false, false, false};
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> data{};
    if (syscall(SYS_capget, &header, data.data()) != 0) return who;
    const auto holds = [&](int capability) { return (data[0].effective & (1U << capability)) != 0; };
    who.overrides = holds(CAP_DAC_OVERRIDE);
    who.readsAll = holds(CAP_DAC_READ_SEARCH);
    who.ownsAll = holds(CAP_FOWNER);
    return who;
}

// A security module that labels files judges beside mode and ACL, so nothing but the kernel's answer counts then.
bool filesAreLabelled() {
    static const bool labelled =
        access("/sys/fs/selinux/enforce", F_OK) == 0 || access("/sys/fs/smackfs/load2", F_OK) == 0;
    return labelled;
}

bool isPlain(const struct statfs& fileSystem) {
    switch (static_cast<unsigned>(fileSystem.f_type)) {
        case EXT4_SUPER_MAGIC:
        case BTRFS_SUPER_MAGIC:
        case TMPFS_MAGIC:
        case kXfsMagic:
            return !filesAreLabelled();
        default:
            return false;
    }
}

bool meansDenied(int systemCode) {
    return systemCode == EACCES || systemCode == EPERM || systemCode == EROFS;
}

// What removing entries of the folder `path` (relative to `dirfd`) takes; one that is denied takes none. 0, or the
// errno value for which that could not be determined.
int readRemovalFacts(int dirfd, const char* path, FolderFacts& facts) {
    _tag_VEXOSTAT_ status;
    if (faccessat(dirfd, path, W_OK | X_OK, AT_EACCESS) != 0 || !vexo::readStatus(dirfd, path, 0, false, status)) {
        return meansDenied(errno) ? 0 : errno;
    }
    facts.removable = (status.st_attributes & VEXO_ATTRIBUTE_APPEND) == 0;
    facts.sticky = (status.st_mode & S_ISVTX) != 0;
    facts.owner = status.st_uid;
    return 0;
}

bool openFolder(int dirfd, VEXOACLFOLDER& folder) {
    struct stat status;
    struct statfs fileSystem;
    if (fstat(dirfd, &status) != 0 || fstatfs(dirfd, &fileSystem) != 0) return false;
    const int before = errno;
    folder.dirfd = dirfd;
    folder.who = currentIdentity();
    const int failure = readRemovalFacts(dirfd, ".", folder.facts);
    folder.facts.device = status.st_dev;
    folder.facts.plain = isPlain(fileSystem);
    folder.facts.readOnly = (fileSystem.f_flags & ST_RDONLY) != 0;
    folder.facts.noExecute = (fileSystem.f_flags & ST_NOEXEC) != 0;
    errno = failure != 0 ? failure : before;
    return failure == 0;
}

// Adds to `granted` the bits that the kernel grants: the likely ones in one question, the rest one by one. 0, or the
// errno value for which it does not judge at all (missing, I/O).
int askKernel(int dirfd, const char* path, int flags, unsigned bits, unsigned likely, unsigned& granted) {
    const vexo::KeepErrno keep;
    int failure = 0;
    const auto allowed = [&](unsigned asked) {
        if (faccessat(dirfd, path, static_cast<int>(asked), AT_EACCESS | flags) == 0) {
            granted |= asked;
            return true;
        }
        if (!meansDenied(errno) && errno != ETXTBSY) failure = errno;
        return false;
    };
    if (likely != 0 && allowed(likely)) bits &= ~likely;
    for (const unsigned bit : {unsigned{R_OK}, unsigned{W_OK}, unsigned{X_OK}}) {
        if (failure == 0 && (bits & bit) != 0) allowed(bit);
    }
    return failure;
}

unsigned permissionOf(unsigned granted, bool removable) {
    unsigned permission = removable ? unsigned{VEXO_ACL_DELETE} : 0U;
    if ((granted & R_OK) != 0) permission |= VEXO_ACL_READ;
    if ((granted & W_OK) != 0) permission |= VEXO_ACL_WRITE | VEXO_ACL_APPEND;
    if ((granted & X_OK) != 0) permission |= VEXO_ACL_EXECUTE;
    return permission;
}

int missingOrOther(int systemCode) {
    return systemCode == ENOENT || systemCode == ENOTDIR ? VEXO_ERR_MISSING : VEXO_ERR_GENERAL;
}

int permissionInFolder(const VEXOACLFOLDER& folder, const char* name, const _tag_VEXOSTAT_& status,
                       unsigned* permission) {
    const vexo::Settled settled = vexo::settle(folder.who, folder.facts, status);
    unsigned granted = settled.granted;
    if (settled.open != 0) {
        const int failure = askKernel(folder.dirfd, name, AT_SYMLINK_NOFOLLOW, settled.open, settled.likely, granted);
        if (failure != 0) return vexo::fail(missingOrOther(failure), failure);
    }
    *permission = permissionOf(granted, vexo::mayRemove(folder.who, folder.facts, status));
    return 0;
}

// Whether the parent folder of `path` lets the effective identity remove it. The last component decides which entry
// that is, so a link is judged itself; "/", "." and ".." are never removed under that name. 0, or the errno value for
// which that could not be determined.
int judgeRemoval(std::string path, bool& removable) {
    const vexo::KeepErrno keep;
    removable = false;
    while (path.size() > 1 && path.back() == '/') path.pop_back();
    const size_t slash = path.rfind('/');
    const std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
    if (name.empty() || name == "." || name == "..") return 0;
    std::string parent = ".";
    if (slash != std::string::npos) parent = slash == 0 ? "/" : path.substr(0, slash);
    _tag_VEXOSTAT_ status;
    if (!vexo::readStatus(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, false, status)) {
        return meansDenied(errno) ? 0 : errno;
    }
    FolderFacts facts{};
    const int failure = readRemovalFacts(AT_FDCWD, parent.c_str(), facts);
    removable = failure == 0 && vexo::mayRemove(currentIdentity(), facts, status);
    return failure;
}

}  // namespace

int VEXOACLPermGet(const char* path, unsigned* permission) try {
    VEXO_GATE("VEXOACLPermGet", -1);
    if (path == nullptr || permission == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    unsigned granted = 0;
    bool removable = false;
    int failure = askKernel(AT_FDCWD, path, 0, R_OK | W_OK | X_OK, 0, granted);
    if (failure == 0) failure = judgeRemoval(path, removable);
    if (failure == 0) {
        *permission = permissionOf(granted, removable);
        return 0;
    }
    _tag_VEXOSTAT_ status;
    const bool dangling = failure == ENOENT && vexo::readStatus(AT_FDCWD, path, AT_SYMLINK_NOFOLLOW, false, status);
    return vexo::fail(dangling ? VEXO_ERR_ACL_TARGET_MISSING : missingOrOther(failure), failure);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

PVEXOACLFOLDER VEXOACLFolderOpen(int dirfd) try {
    VEXO_GATE("VEXOACLFolderOpen", nullptr);
    VEXOACLFOLDER folder{};
    if (!openFolder(dirfd, folder)) {
        vexo::fail(VEXO_ERR_GENERAL);
        return nullptr;
    }
    return new VEXOACLFOLDER(folder);
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

int VEXOACLFolderPermGet(PVEXOACLFOLDER folder, const char* name, const _tag_VEXOSTAT_* status, unsigned* permission) {
    VEXO_GATE("VEXOACLFolderPermGet", -1);
    if (folder == nullptr || name == nullptr || status == nullptr || permission == nullptr) {
        return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    }
    return permissionInFolder(*folder, name, *status, permission);
}

void VEXOACLFolderClose(PVEXOACLFOLDER folder) {
    delete folder;
}
