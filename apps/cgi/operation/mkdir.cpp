#include "operation/operation.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "shown_search.h"
#include "target.h"

namespace orvel::cgi {

int makeFolderOperation(Operation& operation) {
    const bool parents = operation.web.GetParam("parents", "false") == "true";
    const Missing missing = parents ? Missing::kMake : Missing::kRefuse;
    const PathInfo& info = operation.info;
    Target target;
    int code = openTarget(info, linkPolicyOf(info.shareName), operation.user.name, missing, target);
    if (code != ORV_ERR_NONE) return code;
    Descriptor made;
    code = makeFolder(target.folder, target.name, operation.user.name, made);
    if (code != ORV_ERR_NONE) {
        removeMadeFolders(target);
        return code;
    }
    OrvLibDoLog(operation.user.name, info.path, 0, ORVEL_ACTION_MKDIR, true);
    ShownSearch(operation.user.name, operation.web.GetParam("taskid", "")).added({info, target.folder, target.name});
    putPath(operation.data, "path", info.path);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
