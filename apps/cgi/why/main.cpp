// CGI program "why": what decides about the asking user's own access to a path.
//
// Parameters, from the query or a form:
//   path, path_raw   what is asked about
// "data" of the reply is {"share","rule","privilege","administrator","restrictions","remote","read_only","exists",
// "permissions"}: "rule" one of "home", "no_access", "read_write", "read_only", "no_list" and "service"; "privilege" as
// OrvLibGetPrivilege answers, -1 for a home; "restrictions" of the share and "permissions" of the file as words. Real
// paths are not disclosed.
#include <json/value.h>

#include <string>

#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "vexo/web.h"
#include "why/reason.h"

namespace orvel::cgi {
void serveWhyProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const auto path = pathParam(web);
    if (!path || path->empty()) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(*path, nullptr));
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, *path);
    Json::Value data;
    if (!explainAccess(*path, user, data)) return replyFailure(out, Status::kOk, user.cookie, lastCode(), *path);
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, *path, data);
}

}  // namespace orvel::cgi
