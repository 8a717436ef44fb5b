#include "enum/entry_fill.h"

#include <dirent.h>
#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cctype>
#include <cerrno>

#include "base/printable.h"
#include "core/boundary.h"
#include "enum/entry_order.h"
#include "orvel/listing.h"
#include "orvel/privilege.h"
#include "orvel/text.h"
#include "vexo/acl.h"
#include "vexo/filesystem.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelenum";

bool filteredOut(bool isDirectory, _tag_dir_entry_type_ filter) {
    return filter == (isDirectory ? DIR_ENTRY_TYPE_FILE : DIR_ENTRY_TYPE_DIR);
}

// The errors with which a network mount without its server, but also a vanished file, answers.
bool maybeUnreachable(int systemCode) {
    return systemCode == ENOENT || systemCode == EIO || systemCode == ENXIO || systemCode == EHOSTDOWN;
}

const char* mountPointType(const char* realPath, OrvelMountStatus& mounts) {
    const int fsType = mounts.getFSTYPE(realPath);
    if (VEXOFSIsImageFS(fsType) == 1) return "iso";
    return VEXOFSIsRemoteFS(fsType) == 1 ? "remote" : "";
}

}  // namespace

TypeVerdict judgeType(unsigned char dType, _tag_dir_entry_type_ filter, int additional) {
    if (dType == DT_UNKNOWN) return TypeVerdict::AskStatus;
    if (dType != DT_DIR && dType != DT_REG) return TypeVerdict::Skip;
    if (filteredOut(dType == DT_DIR, filter)) return TypeVerdict::Skip;
    return (additional & ~ADDITIONAL_REAL_PATH) == 0 ? TypeVerdict::Keep : TypeVerdict::AskStatus;
}

bool passes(mode_t mode, _tag_dir_entry_type_ filter) {
    return (S_ISDIR(mode) || S_ISREG(mode)) && !filteredOut(S_ISDIR(mode), filter);
}

unsigned statusFlags(int additional) {
    return (additional & ADDITIONAL_TIME) != 0 ? VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME : VEXO_STAT_BASIC;
}

StatusFailure judgeStatusFailure(int systemCode, const char* realPath, OrvelMountStatus& mounts) {
    if (maybeUnreachable(systemCode) && VEXOFSIsRemoteFS(mounts.getFSTYPE(realPath)) == 1) {
        return StatusFailure::Unreachable;
    }
    if (systemCode == ENOENT) return StatusFailure::Vanished;
    if (systemCode == EACCES || systemCode == EPERM) {
        OrvLibSetErr(ORV_ERR_DENIED);
    } else if (!maybeUnreachable(systemCode)) {
        OrvLibSetErr(ORV_ERR_GENERAL);
    }  // an I/O failure sets no code: kept, callers rely on it
    const std::string text = printable(realPath);
    errno = systemCode;
    syslog(LOG_ERR, "%s:%d Failed to stat %s. %m", kSource, __LINE__, text.c_str());
    errno = systemCode;
    return StatusFailure::Fatal;
}

std::string typeOf(const char* name) {
    const char* extension = ReturnFileExt(name, 0);
    std::string type = extension == nullptr ? "" : extension;
    std::transform(type.begin(), type.end(), type.begin(),
                   [](unsigned char c) { return static_cast<char>(toupper(c)); });
    return type;
}

void fillProperties(const char* realPath, const _tag_VEXOSTAT_& status, int additional, OrvelMountStatus& mounts,
                    OrvelUserEnum& names, DIRENTRY_INFO& info) {
    const Figures figures = figuresOf(S_ISDIR(status.st_mode), status);
    if ((additional & ADDITIONAL_MOUNT_POINT_TYPE) != 0) {
        info.mountPointType = figures.isDirectory ? mountPointType(realPath, mounts) : "";
    }
    if ((additional & ADDITIONAL_TYPE) != 0 && !figures.isDirectory) info.type = typeOf(info.name.c_str());
    if ((additional & ADDITIONAL_SIZE) != 0) info.size = figures.size;
    if ((additional & ADDITIONAL_OWNER) != 0) {
        info.uid = figures.uid;
        info.owner = names.GetUserNameByUID(figures.uid);
        info.gid = figures.gid;
        info.group = names.GetGroupNameByGID(figures.gid);
    }
    if ((additional & ADDITIONAL_TIME) != 0) {
        info.mtime = figures.mtime;
        info.ctime = figures.ctime;
        info.crtime = figures.crtime;
        info.atime = figures.atime;
    }
    if ((additional & ADDITIONAL_PERM) != 0) info.mode = figures.mode;
}

}  // namespace orvel

namespace {

int fillFromPath(const char* realPath, _tag_dir_entry_type_ type, int additional, OrvelMountStatus& mounts,
                 OrvelUserEnum& names, DIRENTRY_INFO& info) {
    _tag_VEXOSTAT_ status = {};
    if (VLIBCFileLStat(realPath, orvel::statusFlags(additional), &status) < 0) {
        const auto failure = orvel::judgeStatusFailure(errno, realPath, mounts);
        if (failure == orvel::StatusFailure::Fatal) return -1;
        if (failure == orvel::StatusFailure::Unreachable) {
            info.isDirectory = true;
            info.mountPointType = orvel::kUnreachable;
        }
        return 1;
    }
    if (!orvel::passes(status.st_mode, type)) return 1;
    info.isDirectory = S_ISDIR(status.st_mode);
    orvel::fillProperties(realPath, status, additional, mounts, names, info);
    if ((additional & ADDITIONAL_PERM) != 0) {
        info.aclPrivilege = GetACLPrivilege(realPath);
        info.isAclMode = VEXOACLIsSupport(realPath, -1, 2) > 0 ? 1 : 0;
    }
    return 0;
}

}  // namespace

int OrvEnum::FillFileInfo(const char* path, const char* realPath, const char* name, _tag_dir_entry_type_ type,
                          unsigned char dType, int additional, DIRENTRY_INFO& info) {
    return orvel::guarded(-1, [&] {
        if (path == nullptr || realPath == nullptr || name == nullptr) {
            OrvLibSetErr(ORV_ERR_PARAMETER);
            return -1;
        }
        info.name = name;
        info.path = path;
        info.isDirectory = dType == DT_DIR;
        if ((additional & ADDITIONAL_REAL_PATH) != 0) info.realPath = realPath;
        switch (orvel::judgeType(dType, type, additional)) {
            case orvel::TypeVerdict::Keep:
                return 0;
            case orvel::TypeVerdict::Skip:
                return 1;
            case orvel::TypeVerdict::AskStatus:
                break;
        }
        return fillFromPath(realPath, type, additional, mounts_, names_, info);
    });
}
