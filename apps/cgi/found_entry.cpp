#include "found_entry.h"

#include <climits>
#include <cstdlib>

#include "orvel/privilege.h"
#include "vexo/acl.h"
#include "vexo/share.h"

namespace orvel::cgi {
namespace {

std::string homeOf(const std::string& user) {
    char path[PATH_MAX], canonical[PATH_MAX];
    if (VEXOServiceHomePathGet(user.c_str(), path, sizeof path) != 0) return "";
    return realpath(path, canonical) != nullptr ? canonical : "";
}

}  // namespace

FoundEntries::FoundEntries(const std::string& user, int additional) : home_(homeOf(user)), additional_(additional) {}

DIRENTRY_INFO FoundEntries::entryOf(const __tag_FI_FILE_INFO_DATA& record) const {
    DIRENTRY_INFO entry;
    entry.name = record.szName;
    entry.realPath = std::string(record.szShareRoot) + "/" + record.szPath;
    const bool own = !home_.empty() && entry.realPath.starts_with(home_ + "/");
    entry.path =
        own ? "/home" + entry.realPath.substr(home_.size()) : "/" + std::string(record.szShare) + "/" + record.szPath;
    entry.isDirectory = record.isDir != 0;
    if (!entry.isDirectory) entry.type = record.szExtension;
    entry.size = record.size;
    entry.mode = record.mode;
    entry.uid = record.uid;
    entry.gid = record.gid;
    entry.owner = record.szOwner;
    entry.group = record.szGroup;
    entry.mtime = static_cast<uint32_t>(record.modified);
    entry.ctime = static_cast<uint32_t>(record.changed);
    entry.crtime = static_cast<uint32_t>(record.created);
    entry.atime = static_cast<uint32_t>(record.accessed);
    if ((additional_ & ADDITIONAL_PERM) != 0) {
        entry.aclPrivilege = GetACLPrivilege(entry.realPath.c_str());
        entry.isAclMode = VEXOACLIsSupport(entry.realPath.c_str(), -1, 2) > 0 ? 1 : 0;
    }
    return entry;
}

}  // namespace orvel::cgi
