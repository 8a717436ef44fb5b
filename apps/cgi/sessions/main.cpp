// CGI program "sessions": where the user is logged in.
#include <json/value.h>

#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "text.h"
#include "vexo/session.h"

namespace orvel::cgi {

void serveSessionsProgram(Request&, Output& out) {
    WebMan session;
    if (!session.IsAuthorized("", 0, CGI_POSITION_DESKTOP) || isMeantForAnother(session.GetLoginUserName())) {
        return replyFailure(out, Status::kNotLoggedIn, "", ORV_ERR_DENIED, "");
    }
    Json::Value data;
    Json::Value& items = data["items"] = Json::Value(Json::arrayValue);
    for (const WebSession& kept : session.Sessions()) {
        Json::Value item;
        item["id"] = kept.id;
        item["address"] = readable(kept.address);
        item["browser"] = readable(kept.browser);
        item["since"] = static_cast<Json::Int64>(kept.since);
        item["used"] = static_cast<Json::Int64>(kept.used);
        item["current"] = kept.current;
        items.append(item);
    }
    reply(out, Status::kOk, session.GetNewCookie(), ORV_ERR_NONE, "", data);
}

}  // namespace orvel::cgi
