#include "orvel/file_info.h"

#include <json/value.h>
#include <syslog.h>

#include <cstring>
#include <string>

#include "core/boundary.h"
#include "enum/file_info_writer.h"
#include "orvel/dir_entry.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelmisc";

// The object at `place`; another kind of value there would make jsoncpp throw, so it gives way.
Json::Value& asObject(Json::Value& place) {
    if (!place.isObject()) place = Json::Value(Json::objectValue);
    return place;
}

Json::Value& freshObject(Json::Value& parent, const char* key) {
    return parent[key] = Json::Value(Json::objectValue);
}

void dumpOwner(const DIRENTRY_INFO& info, Json::Value& additional) {
    Json::Value& owner = freshObject(additional, "owner");
    owner["uid"] = Json::UInt(info.uid);
    owner["user"] = info.owner;
    owner["gid"] = Json::UInt(info.gid);
    owner["group"] = info.group;
}

void dumpTime(const DIRENTRY_INFO& info, Json::Value& additional) {
    Json::Value& time = freshObject(additional, "time");
    time["ctime"] = Json::UInt(info.ctime);
    time["atime"] = Json::UInt(info.atime);
    time["mtime"] = Json::UInt(info.mtime);
    time["crtime"] = Json::UInt(info.crtime);
}

// Callers put members of their own into "perm" beforehand, so it is not made anew.
void dumpPermission(const DIRENTRY_INFO& info, Json::Value& additional) {
    Json::Value& perm = asObject(additional["perm"]);
    perm["posix"] = GetPrivilege(info.mode);
    perm["is_acl_mode"] = info.isAclMode != 0;
    const AclFlags flags = aclFlagsOf(info.aclPrivilege);
    Json::Value& acl = freshObject(perm, "acl");
    acl["exec"] = flags.exec;
    acl["write"] = flags.write;
    acl["read"] = flags.read;
    acl["append"] = flags.append;
    acl["del"] = flags.del;
}

void dumpVolume(const DIRENTRY_INFO& info, Json::Value& additional) {
    Json::Value& volume = freshObject(additional, "volume_status");
    volume["readonly"] = info.readOnly;
    volume["freespace"] = static_cast<double>(info.freeSpace);
    volume["totalspace"] = static_cast<double>(info.totalSpace);
}

void dump(int bits, const DIRENTRY_INFO& info, Json::Value& out) {
    asObject(out);
    out["name"] = info.name;
    out["path"] = info.path;
    out["isdir"] = info.isDirectory;
    if ((bits & kWrittenBits) == 0) return;
    Json::Value& additional = asObject(out["additional"]);
    if ((bits & ADDITIONAL_REAL_PATH) != 0) additional["real_path"] = info.realPath;
    if ((bits & ADDITIONAL_MOUNT_POINT_TYPE) != 0) additional["mount_point_type"] = info.mountPointType;
    if ((bits & ADDITIONAL_SIZE) != 0) additional["size"] = static_cast<double>(info.size);
    if ((bits & ADDITIONAL_TYPE) != 0) additional["type"] = info.type;
    if ((bits & ADDITIONAL_OWNER) != 0) dumpOwner(info, additional);
    if ((bits & ADDITIONAL_TIME) != 0) dumpTime(info, additional);
    if ((bits & ADDITIONAL_PERM) != 0) dumpPermission(info, additional);
    if ((bits & ADDITIONAL_VOLUME_STATUS) != 0) dumpVolume(info, additional);
}

bool joinPaths(const Json::Value& paths, std::string& out) {
    if (!paths.isArray()) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        syslog(LOG_ERR, "%s:%d Wrong JSON format", kSource, __LINE__);
        return false;
    }
    out.clear();
    for (const Json::Value& element : paths) {
        const char* text = element.isString() ? element.asCString() : nullptr;
        if (text == nullptr) continue;
        const char* slash = strchr(text, '/');
        if (!out.empty()) out += ", ";
        out += slash != nullptr ? slash : text;
    }
    return true;
}

}  // namespace
}  // namespace orvel

void DumpFileInfo(int additional, const DIRENTRY_INFO& info, Json::Value& out) {
    orvel::guarded(false, [&] { return orvel::dump(additional, info, out), true; });
}

void AppendFileInfoText(int additional, const DIRENTRY_INFO& info, std::string& out) {
    orvel::guarded(false, [&] { return orvel::appendFileInfoText(additional, info, out), true; });
}

bool ParseJsonPathToString(const Json::Value& paths, std::string& out) {
    return orvel::guarded(false, [&] { return orvel::joinPaths(paths, out); });
}
