#include <cerrno>

#include "operation/operation.h"
#include "operation/rename_new.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "orvel/name_check.h"
#include "reply.h"
#include "shown_search.h"
#include "target.h"
#include "vexo/filesystem.h"

namespace orvel::cgi {
int renameOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    const auto name = bytesParam(operation.web, "name");
    if (!name) return ORV_ERR_PARAMETER;
    Target target;
    const int code = openTarget(info, linkPolicyOf(info.shareName), operation.user.name, Missing::kRefuse, target);
    if (code != ORV_ERR_NONE) return code;
    if (VEXOEAIsHiddenFile(target.name.c_str()) != 0) return ORV_ERR_MISSING;
    OrvLibSetErr(ORV_ERR_NONE);
    if (OrvCheckFileName(realPathOf(target.folder).c_str(), name->c_str()) != 0) return lastCode(ORV_ERR_GENERAL);
    if (!renameNew(target.folder.get(), target.name, target.folder.get(), *name)) {
        return OrvParseErrnoToError(errno, info.shareName.c_str(), info.realPath.c_str());
    }
    OrvLibDoLog(operation.user.name, info.path, 0, ORVEL_ACTION_RENAME, false);
    ShownSearch(operation.user.name, operation.web.GetParam("taskid", ""))
        .moved({info, target.folder, target.name}, {info, target.folder, *name});
    putPath(operation.data, "path", info.path.substr(0, info.path.rfind('/') + 1) + *name);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
