#include <vector>

#include "confined.h"
#include "operation/operation.h"
#include "orvel/directory_walker.h"
#include "orvel/error_state.h"
#include "reply.h"

namespace orvel::cgi {

int subfoldersOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    Descriptor folder;
    std::string realPath;
    const int code = confinedFolder(info, linkPolicyOf(info.shareName), folder, realPath);
    if (code != ORV_ERR_NONE) return code;
    std::vector<_tag_SUBDIR_ENTRY_INFO_> folders;
    if (!OrvLibEnumSubDir(folder.path(), folders)) return lastCode(ORV_ERR_GENERAL);

    Json::Value& items = operation.data["items"] = Json::Value(Json::arrayValue);
    for (const _tag_SUBDIR_ENTRY_INFO_& found : folders) {
        Json::Value item;
        putPath(item, "name", found.name);
        putPath(item, "path", info.path + "/" + found.name);
        item["mtime"] = found.mtime;
        if (found.isMountPoint) item["mount_type"] = found.mountType;
        items.append(item);
    }
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
