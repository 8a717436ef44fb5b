// CGI program "operation": what a user does to files.
//
// Parameters, from the query or a form:
//   action           a name of kActions; more of each at its function
//   path, path_raw   what it is done to; may be given more than once where the action goes on in the background
//   taskid           of an action on files: a search whose results shall show what was done; else the task meant
// Actions that change something must be posted.
#include <algorithm>
#include <string_view>

#include "operation/judge.h"
#include "operation/operation.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "search_task.h"

namespace orvel::cgi {
namespace {

enum class Takes { kPath, kPaths, kTask };

struct Action {
    std::string_view name;
    Takes takes;
    bool changes;  // must be posted
    Need need;     // asked here for the action of one path; the others ask for each
    int (*run)(Operation& operation);
};

constexpr Action kActions[] = {{"mkdir", Takes::kPath, true, Need::kCreate, makeFolderOperation},
                               {"rename", Takes::kPath, true, Need::kModify, renameOperation},
                               {"subfolders", Takes::kPath, false, Need::kList, subfoldersOperation},
                               {"present", Takes::kPath, false, Need::kList, presentOperation},
                               {"copy", Takes::kPaths, true, Need::kRead, copyOperation},
                               {"move", Takes::kPaths, true, Need::kModify, moveOperation},
                               {"delete", Takes::kPaths, true, Need::kModify, deleteOperation},
                               {"restore", Takes::kPaths, true, Need::kModify, restoreOperation},
                               {"recover", Takes::kPaths, true, Need::kModify, recoverOperation},
                               {"empty", Takes::kPaths, true, Need::kModify, emptyOperation},
                               {"compress", Takes::kPaths, true, Need::kRead, compressOperation},
                               {"extract", Takes::kPaths, true, Need::kRead, extractOperation},
                               {"measure", Takes::kPaths, true, Need::kList, measureOperation},
                               {"permit", Takes::kPaths, true, Need::kModify, permitOperation},
                               {"permissions", Takes::kPaths, false, Need::kList, permissionsOperation},
                               {"access", Takes::kPath, false, Need::kList, accessOperation},
                               {"undo", Takes::kTask, true, Need::kModify, undoOperation},
                               {"status", Takes::kTask, false, Need::kList, statusOperation},
                               {"cancel", Takes::kTask, true, Need::kList, cancelOperation},
                               {"clear", Takes::kTask, true, Need::kList, clearOperation}};

const Action* actionOf(const std::string& name) {
    for (const Action& action : kActions) {
        if (action.name == name) return &action;
    }
    return nullptr;
}

// Rows are chosen in place of paths, not beside them.
bool readPaths(const VEXO::WebCGI& web, Takes takes, std::vector<std::string>& paths) {
    if (takes == Takes::kTask) return true;
    const auto found = takes == Takes::kPaths ? pathParams(web) : std::nullopt;
    const auto one = takes == Takes::kPath ? pathParam(web) : std::nullopt;
    if (found) paths = *found;
    if (one) paths = {*one};
    const std::string search = web.GetParam("taskid", "");
    const bool rows = takes == Takes::kPaths && ChosenRows::isIn(web);
    return paths.empty() == rows && (search.empty() || isTaskId(search));
}

bool isInHome(const VEXO::WebCGI& web, const std::vector<std::string>& paths) {
    const auto isHome = [](const std::string& path) { return IsDirUserHome(path, nullptr); };
    return std::any_of(paths.begin(), paths.end(), isHome) || isHome(bytesParam(web, "target").value_or(""));
}

int performOnMany(Operation& operation, const Action& action) {
    if (!ChosenRows::isIn(operation.web)) return action.run(operation);
    const int code = operation.chosen.findRows(operation.user, operation.web, operation.data);
    operation.culprit = operation.chosen.path(0);
    return code == ORV_ERR_NONE ? action.run(operation) : code;
}

int perform(Operation& operation, const Action& action, bool home) {
    const User& user = operation.user;
    int code = actAs(user.sid.c_str(), user.name, home);
    if (code != ORV_ERR_NONE) return code;
    if (action.takes == Takes::kPaths) return performOnMany(operation, action);
    if (action.takes == Takes::kTask) return action.run(operation);
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), operation.path, operation.info)) return lastCode();
    code = judge(user, operation.info.path, action.need);
    return code == ORV_ERR_NONE ? action.run(operation) : code;
}

}  // namespace

void serveOperationProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const Action* action = actionOf(web.GetParam("action", ""));
    std::vector<std::string> paths;
    if (action == nullptr || (action->changes && !isPosted()) || !readPaths(web, action->takes, paths)) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    const bool home = isInHome(web, paths);
    const std::string first = paths.empty() ? "" : paths.front();
    Operation operation = {.user = user,
                           .web = web,
                           .path = first,
                           .info = {},
                           .chosen = Choice(std::move(paths)),
                           .culprit = first,
                           .data = {},
                           .key = nullptr};
    const int code = perform(operation, *action, home);
    if (operation.key != nullptr) {
        return replyOwnFailure(out, Status::kOk, user.cookie, code, operation.key, operation.culprit, operation.data);
    }
    reply(out, statusOf(code), user.cookie, code, operation.culprit, operation.data);
}

}  // namespace orvel::cgi
