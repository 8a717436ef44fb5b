// CGI program "operation": what a user does to files.
//
// Parameters, from the query or a form:
//   action           "mkdir", "rename" or "subfolders"; more of each at its function
//   path, path_raw   what it is done to
//   taskid           a search whose results shall show what was done
// Actions that change something must be posted.
#include <sys/stat.h>

#include <string_view>

#include "operation/operation.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "reply.h"
#include "search_task.h"

namespace orvel::cgi {
namespace {

enum class Need { kList, kCreate, kModify };

struct Action {
    std::string_view name;
    Need need;
    int (*run)(Operation& operation);
};

constexpr Action kActions[] = {{"mkdir", Need::kCreate, makeFolderOperation},
                               {"rename", Need::kModify, renameOperation},
                               {"subfolders", Need::kList, subfoldersOperation}};

const Action* actionOf(const std::string& name) {
    for (const Action& action : kActions) {
        if (action.name == name) return &action;
    }
    return nullptr;
}

// The share's rule for the path; below a home folder the file system alone decides.
int judge(const Operation& operation, Need need) {
    const char* user = operation.user.name.c_str();
    const char* sid = operation.user.sid.c_str();
    const char* path = operation.info.path.c_str();
    OrvLibSetErr(ORV_ERR_NONE);
    if (need == Need::kList) return CheckShareListPrivilege(user, sid, path) ? ORV_ERR_NONE : lastCode(ORV_ERR_DENIED);
    if (IsDirUserHome(path, nullptr)) return ORV_ERR_NONE;
    int privilege = ORV_PRIVILEGE_UNKNOWN, mask = 0;
    if (OrvLibGetPrivilege(path, user, sid, &privilege, &mask) != 0) return lastCode();
    const bool fixed = need == Need::kModify && (mask & ORV_MASK_NO_MODIFYING) != 0;
    return privilege == ORV_PRIVILEGE_READ_WRITE && !fixed ? ORV_ERR_NONE : ORV_ERR_DENIED;
}

int perform(Operation& operation, const Action& action) {
    const User& user = operation.user;
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(operation.path, nullptr));
    if (code != ORV_ERR_NONE) return code;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), operation.path, operation.info)) return lastCode();
    code = judge(operation, action.need);
    return code == ORV_ERR_NONE ? action.run(operation) : code;
}

void serve(Output& out) {
    umask(022);  // whatever the web server's is
    User user;
    if (!begin(out, user)) return;

    const VEXO::WebCGI web;
    if (web.BodyRefused()) return replyFailure(out, Status::kTooLarge, user.cookie, ORV_ERR_PARAMETER, "");
    const auto path = pathParam(web);
    const Action* action = actionOf(web.GetParam("action", ""));
    const std::string search = web.GetParam("taskid", "");
    if (!path || action == nullptr || (!search.empty() && !isTaskId(search)) ||
        (action->need != Need::kList && !isPosted())) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    Operation operation = {.user = user, .web = web, .path = *path, .info = {}, .data = {}};
    const int code = perform(operation, *action);
    reply(out, Status::kOk, user.cookie, code, *path, operation.data);
}

}  // namespace
}  // namespace orvel::cgi

int main() {
    return orvel::cgi::runProgram(orvel::cgi::serve);
}
