// CGI program "preferences": what the user chose in the page, the same in every browser.
//
// Parameters, from the query or a form:
//   action   "get": all of them
//            "set" (posted): takes over each member of `values`, a JSON object; null removes one
// "data" of the reply is {"values"}, all of them. What they mean is the page's alone.
#include <json/value.h>

#include "orvel/error_state.h"
#include "preferences/store.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "vexo/web.h"

namespace orvel::cgi {

void servePreferencesProgram(Request& request, Output& out) {
    const User& user = request.user;
    const std::string action = request.web.GetParam("action", "");
    Json::Value changes, data;
    const bool sets = action == "set";
    if ((!sets && action != "get") ||
        (sets && (!isPosted() || !parsePreferences(request.web.GetParam("values", ""), changes)))) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, "");
    }
    Json::Value& values = data["values"];
    const int code = sets ? changePreferences(user.name, changes, values) : readPreferences(user.name, values);
    if (code != ORV_ERR_NONE) return replyFailure(out, Status::kOk, user.cookie, code, "");
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, "", data);
}

}  // namespace orvel::cgi
