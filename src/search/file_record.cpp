#include "orvel/file_record.h"

#include <algorithm>
#include <cstdint>
#include <string_view>

#include "orvel/privilege.h"
#include "search/share_address.h"

namespace FileSearch {
namespace {

constexpr std::size_t kNameLimit = 492;  // of share and owner names, in bytes
constexpr std::size_t kGroupLimit = 128;
constexpr mode_t kFileTypeBits = 0xF000;
constexpr mode_t kFolder = 0x4000;

char upper(char c) {
    return c >= 'a' && c <= 'z' ? static_cast<char>(c - ('a' - 'A')) : c;
}

// What stands behind the last dot, even if that is the first character, and also of a folder (kept: results are
// sorted by it).
void putExtension(const std::string& name, std::string& out) {
    const std::size_t dot = name.rfind('.');
    out.clear();
    if (dot == std::string::npos) return;
    out.assign(name, dot + 1);
    std::transform(out.begin(), out.end(), out.begin(), upper);
}

// Root and unknown ids show as numbers (kept).
void putOwner(const std::string& name, uint32_t id, std::size_t limit, std::string& out) {
    if (name.empty() || name == "root") {
        out = std::to_string(id);
    } else {
        out.assign(name, 0, limit);
    }
}

}  // namespace

FileRecord::FileRecord() : data_{} {}
FileRecord::~FileRecord() = default;

PathFault FileRecord::fill(const std::string& realPath, const std::string& shareRoot, const std::string& shareName,
                           const std::string& name, const _tag_VEXOSTAT_& status) {
    return fill(realPath, shareRoot, shareName, name, status, names_.GetUserNameByUID(status.st_uid),
                names_.GetGroupNameByGID(status.st_gid));
}

PathFault FileRecord::fill(const std::string& realPath, const std::string& shareRoot, const std::string& shareName,
                           const std::string& name, const _tag_VEXOSTAT_& status, const std::string& owner,
                           const std::string& group) {
    std::size_t within = 0;
    const PathFault fault = orvel::splitRealPath(realPath, shareRoot, within);
    if (fault != PathFault::kNone) return fault;
    const std::size_t slash = std::max(realPath.rfind('/'), within);
    share_.assign(shareName, 0, kNameLimit);
    parent_.assign(realPath, within, slash - within);
    putExtension(name, extension_);
    permission_ = GetPrivilegeStr(status.st_mode);
    putOwner(owner, status.st_uid, kNameLimit, owner_);
    putOwner(group, status.st_gid, kGroupLimit, group_);
    const bool isFolder = (status.st_mode & kFileTypeBits) == kFolder;
    data_ = {.szShareRoot = shareRoot.c_str(),
             .szShare = share_.c_str(),
             .szName = name.c_str(),
             .szPath = realPath.c_str() + within,
             .szParent = parent_.c_str(),
             .szExtension = extension_.c_str(),
             .szPermission = permission_.c_str(),
             .szOwner = owner_.c_str(),
             .szGroup = group_.c_str(),
             .isDir = isFolder ? 1 : 0,
             .size = isFolder ? 0 : status.st_size,
             .created = status.st_create,
             .changed = status.st_change,
             .accessed = status.st_access,
             .modified = status.st_modify,
             .mode = status.st_mode,
             .uid = status.st_uid,
             .gid = status.st_gid};
    return PathFault::kNone;
}

}  // namespace FileSearch
