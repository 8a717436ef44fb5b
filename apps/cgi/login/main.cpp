// CGI program "login": who is logged in, and the conversation in which somebody logs in (vexo/login.h).
//
// Parameters, from the query or a form:
//   action     none: {"user", "machine"}; the rest is posted
//              "begin": with `user`, and `password`, the answer to the first question that is hidden
//              "answer": with `text`
//              "cancel"
// The cookie "login" ("__Host-login" by HTTPS) holds the conversation together, so what an answer needs to be heard is
// nowhere a script could read it.
#include <json/value.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <string>
#include <string_view>
#include <utility>

#include "base/printable.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "text.h"
#include "vexo/login.h"
#include "vexo/session.h"

namespace orvel::cgi {
namespace {

struct Refusal {
    int reason;
    Status status;
    int code;
    const char* key;
};

constexpr Refusal kRefusals[] = {{VEXO_LOGIN_WRONG, Status::kForbidden, 2001, "login_wrong"},
                                 {VEXO_LOGIN_EXPIRED, Status::kForbidden, 2002, "login_expired"},
                                 {VEXO_LOGIN_LOCKED, Status::kForbidden, 2003, "login_locked"},
                                 {VEXO_LOGIN_BLOCKED, Status::kTooMany, 2004, "login_blocked"},
                                 {VEXO_LOGIN_BUSY, Status::kTooMany, 2005, "login_busy"},
                                 {VEXO_LOGIN_OVER, Status::kForbidden, 2006, "login_over"},
                                 {VEXO_LOGIN_TWICE, Status::kTooMany, 2007, "login_twice"},
                                 {VEXO_LOGIN_SERVICE, Status::kBusy, 2008, "login_service"}};

// A parameter that is not kept longer than it is needed.
struct Secret {
    explicit Secret(std::string value) : text(std::move(value)) {}
    ~Secret() { explicit_bzero(text.data(), text.size()); }
    Secret(const Secret&) = delete;
    Secret& operator=(const Secret&) = delete;
    std::string text;
};

bool isSecure() {
    const char* https = getenv("HTTPS");
    return https != nullptr && std::string_view(https) == "on";
}

const char* cookieName() {
    return isSecure() ? "__Host-login" : "login";
}

// The reply sets, or with "" removes, the cookie of the conversation.
void putCookie(Output& out, const std::string& id) {
    out.text() += std::string("Set-Cookie: ") + cookieName() + "=" + id + "; Path=/; HttpOnly; SameSite=Strict" +
                  (id.empty() ? "; Max-Age=0" : "") + (isSecure() ? "; Secure" : "") + "\r\n";
}

Json::Value messagesOf(const VEXOLOGIN& step) {
    Json::Value messages(Json::arrayValue);
    std::string_view rest = step.messages;
    while (!rest.empty()) {
        const size_t end = std::min(rest.find('\n'), rest.size());
        if (end > 0) messages.append(readable(rest.substr(0, end)));
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    return messages;
}

void replyRefusal(Output& out, const VEXOLOGIN& step) {
    const auto* found = std::find_if(std::begin(kRefusals), std::end(kRefusals),
                                     [&](const Refusal& refusal) { return refusal.reason == step.reason; });
    const Refusal& refusal = found == std::end(kRefusals) ? *std::prev(found) : *found;
    Json::Value data;
    if (step.wait > 0) {
        data["wait"] = step.wait;
        out.text() += "Retry-After: " + std::to_string(step.wait) + "\r\n";
    }
    replyOwnFailure(out, refusal.status, "", refusal.code, refusal.key, "", data);
}

void replyDone(Output& out, const VEXOLOGIN& step) {
    WebMan session;
    if (!session.LogIn(step.user)) {
        syslog(LOG_ERR, "log-in: no session could be made for \"%s\"", readable(step.user).c_str());
        return replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
    }
    syslog(LOG_AUTHPRIV | LOG_INFO, "log-in from %s accepted: \"%s\"", clientAddress().c_str(),
           printable(step.user).c_str());
    Json::Value data;
    data["step"] = "done";
    data["user"] = readable(step.user);
    data["messages"] = messagesOf(step);
    reply(out, Status::kOk, session.GetNewCookie(), ORV_ERR_NONE, "", data);
}

void replyStep(Output& out, const VEXOLOGIN& step) {
    if (step.reason != VEXO_LOGIN_TWICE) putCookie(out, step.id);
    if (step.step == VEXO_LOGIN_REFUSED) return replyRefusal(out, step);
    if (step.step == VEXO_LOGIN_DONE) return replyDone(out, step);
    Json::Value data;
    data["step"] = "ask";
    data["text"] = readable(step.text);
    data["hidden"] = step.hidden != 0;
    data["messages"] = messagesOf(step);
    reply(out, Status::kOk, "", ORV_ERR_NONE, "", data);
}

void serveBegin(Output& out, const VEXO::WebCGI& web) {
    const std::string address = clientAddress();
    VEXOLogInEnd(web.GetCookie(cookieName(), "").c_str(), address.c_str());
    VEXOLOGIN step;
    VEXOLogInBegin(web.GetParam("user", "").c_str(), address.c_str(), &step);
    if (step.step == VEXO_LOGIN_ASK && step.hidden != 0 && web.HasParam("password")) {
        const Secret password(web.GetParam("password", ""));
        const std::string id = step.id;
        VEXOLogInAnswer(id.c_str(), address.c_str(), password.text.data(), password.text.size(), &step);
    }
    replyStep(out, step);
}

void serveAnswer(Output& out, const VEXO::WebCGI& web) {
    const Secret answer(web.GetParam("text", ""));
    VEXOLOGIN step;
    VEXOLogInAnswer(web.GetCookie(cookieName(), "").c_str(), clientAddress().c_str(), answer.text.data(),
                    answer.text.size(), &step);
    replyStep(out, step);
}

void serveCancel(Output& out, const VEXO::WebCGI& web) {
    VEXOLogInEnd(web.GetCookie(cookieName(), "").c_str(), clientAddress().c_str());
    putCookie(out, "");
    reply(out, Status::kOk, "", ORV_ERR_NONE, "", Json::Value(Json::objectValue));
}

void serveState(Output& out) {
    WebMan session;
    session.IsAuthorized("", 0, CGI_POSITION_DESKTOP);
    char machine[256] = {};
    gethostname(machine, sizeof machine - 1);
    Json::Value data;
    data["user"] = readable(session.GetLoginUserName());
    data["machine"] = readable(machine);
    reply(out, Status::kOk, session.GetNewCookie(), ORV_ERR_NONE, "", data);
}

}  // namespace

void serveLogInProgram(Request& request, Output& out) {
    const std::string action = request.web.GetParam("action", "");
    if (action.empty() && !isPosted()) return serveState(out);
    if (isForeign()) return replyFailure(out, Status::kForbidden, "", ORV_ERR_DENIED, "");
    if (!isPosted()) return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
    if (action == "begin") return serveBegin(out, request.web);
    if (action == "answer") return serveAnswer(out, request.web);
    if (action == "cancel") return serveCancel(out, request.web);
    replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
}

}  // namespace orvel::cgi
