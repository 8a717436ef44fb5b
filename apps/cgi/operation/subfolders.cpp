#include "operation/subfolders.h"

#include <sys/stat.h>

#include <vector>

#include "confined.h"
#include "operation/judge.h"
#include "operation/operation.h"
#include "orvel/directory_walker.h"
#include "orvel/error_state.h"
#include "reply.h"

namespace orvel::cgi {
namespace {

constexpr Json::ArrayIndex kMostAbove = 32;
constexpr off_t kSoonRead = off_t{64} * 1024;  // bytes of a folder itself: some thousand names

int openToRead(const User& user, const std::string& path, Descriptor& folder) {
    PathInfo info;
    std::string realPath;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, info)) return lastCode();
    const int code = judge(user, info.path, Need::kList);
    return code == ORV_ERR_NONE ? confinedFolder(info, linkPolicyOf(info.shareName), folder, realPath) : code;
}

}  // namespace

int subfoldersOf(const Descriptor& folder, const std::string& path, Json::Value& items) {
    std::vector<_tag_SUBDIR_ENTRY_INFO_> folders;
    if (!OrvLibEnumSubDir(folder.path(), folders)) return lastCode(ORV_ERR_GENERAL);
    items = Json::Value(Json::arrayValue);
    for (const _tag_SUBDIR_ENTRY_INFO_& found : folders) {
        Json::Value item;
        putPath(item, "name", found.name);
        putPath(item, "path", path + "/" + found.name);
        item["mtime"] = found.mtime;
        if (found.isMountPoint) item["mount_type"] = found.mountType;
        items.append(item);
    }
    return ORV_ERR_NONE;
}

Json::Value subfoldersAbove(const User& user, const std::string& path) {
    Json::Value folders(Json::arrayValue);
    for (size_t end = path.find('/', 1); end < path.size() && folders.size() < kMostAbove;
         end = path.find('/', end + 1)) {
        const std::string above = path.substr(0, end);
        Descriptor folder;
        struct stat status {};
        Json::Value one;
        if (openToRead(user, above, folder) != ORV_ERR_NONE || fstat(folder.get(), &status) != 0) continue;
        if (status.st_size > kSoonRead || subfoldersOf(folder, above, one["items"]) != ORV_ERR_NONE) continue;
        putPath(one, "path", above);
        folders.append(one);
    }
    return folders;
}

int subfoldersOperation(Operation& operation) {
    Descriptor folder;
    std::string realPath;
    const int code = confinedFolder(operation.info, linkPolicyOf(operation.info.shareName), folder, realPath);
    return code == ORV_ERR_NONE ? subfoldersOf(folder, operation.info.path, operation.data["items"]) : code;
}

}  // namespace orvel::cgi
