// CGI program "logout": ends sessions of the user (posted).
//
// Parameter `scope`: "this" (default), "others", "all", or the id of one as the program "sessions" gives it.
#include <json/value.h>
#include <syslog.h>

#include <string>

#include "base/printable.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "vexo/session.h"

namespace orvel::cgi {

void serveLogOutProgram(Request& request, Output& out) {
    if (isForeign()) return replyFailure(out, Status::kForbidden, "", ORV_ERR_DENIED, "");
    const std::string scope = request.web.GetParam("scope", "this");
    WebMan session;
    int ended = 0;
    if (session.IsAuthorized("", 0, CGI_POSITION_DESKTOP) && !isMeantForAnother(session.GetLoginUserName())) {
        ended = session.LogOut(scope);
        syslog(LOG_AUTHPRIV | LOG_INFO, "log-out from %s (%d ended): \"%s\"", clientAddress().c_str(), ended,
               printable(session.GetLoginUserName()).c_str());
    }
    Json::Value data;
    data["ended"] = ended;
    reply(out, Status::kOk, session.GetNewCookie(), ORV_ERR_NONE, "", data);
}

}  // namespace orvel::cgi
