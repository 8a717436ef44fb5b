// CGI program "search": searches that go on behind the requests, and pages of what they found.
//
// Parameters, from the query or a form:
//   action           "start" (see startSearch), "list" (see listResults), "stop" or "clean"
//   taskid           the search (all but "start")
// "stop" ends a search with what it has found: data {"finished"}, false when it has not ended within two seconds.
// "clean" ends it and removes what it found. All but "list" must be posted.
#include <json/value.h>

#include <string>

#include "orvel/error_state.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "search/actions.h"
#include "search_task.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

void stopSearch(Output& out, const User& user, const SearchTask& task) {
    Json::Value data;
    data["finished"] = endWork(*task.record, false);
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, "", data);
}

void cleanSearch(Output& out, const User& user, const SearchTask& task) {
    endWork(*task.record, true);
    reply(out, Status::kOk, user.cookie, removeTask(task) ? ORV_ERR_NONE : ORV_ERR_GENERAL, "", Json::Value());
}

void serveTask(Output& out, const User& user, const VEXO::WebCGI& web, const std::string& action) {
    const std::string id = web.GetParam("taskid", "");
    if (!isTaskId(id)) return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, "");
    SearchTask task;
    int code = actAs(user.sid.c_str(), user.name, false);
    if (code == ORV_ERR_NONE) code = findTask(user.name, id, task);
    if (code != ORV_ERR_NONE) return replyFailure(out, Status::kOk, user.cookie, code, "");
    if (action == "list") return listResults(out, user, web, task);
    if (action == "stop") return stopSearch(out, user, task);
    cleanSearch(out, user, task);
}

}  // namespace

void serveSearchProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const std::string action = web.GetParam("action", "");
    const bool changes = action == "start" || action == "stop" || action == "clean";
    if (action != "list" && (!changes || !isPosted())) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, "");
    }
    if (action == "start") return startSearch(out, user, web);
    serveTask(out, user, web, action);
}

}  // namespace orvel::cgi
