#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "base/new_file.h"
#include "operation/item.h"
#include "operation/operation.h"
#include "operation/task_start.h"
#include "operation/undo_record.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "shown_search.h"
#include "target.h"

namespace orvel::cgi {

int renameOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    const auto name = bytesParam(operation.web, "name");
    if (!name) return ORV_ERR_PARAMETER;
    Target target;
    int code = openPresent(info, target);
    if (code != ORV_ERR_NONE) return code;
    struct stat status {};
    const bool isFolder =
        fstatat(target.folder.get(), target.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
    const std::string renamed = info.path.substr(0, info.path.rfind('/') + 1) + *name;
    code = checkChangeable({Need::kModify}, target.folder, target.name);
    if (code == ORV_ERR_NONE) code = checkNewName(target.folder, *name);
    if (code == ORV_ERR_NONE && !renameNew(target.folder.get(), target.name, target.folder.get(), *name)) {
        code = OrvParseErrnoToError(errno, info.shareName.c_str(), info.realPath.c_str());
    }
    if (code == ORV_ERR_EXISTS) operation.culprit = renamed;
    if (code != ORV_ERR_NONE) return code;
    OrvLibDoLog(operation.user.name, info.path, 0, ORVEL_ACTION_RENAME, isFolder);
    ShownSearch(operation.user.name, operation.web.GetParam("taskid", ""))
        .moved({info, target.folder, target.name}, {info, target.folder, *name});
    putPath(operation.data, "path", renamed);
    UndoRecord undo(operation.user.name, newTaskId("rename"));
    undo.moved(target.folder.get(), *name, renamed, info.path, status);
    if (undo.count() > 0) operation.data["undo"] = undo.id();
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
