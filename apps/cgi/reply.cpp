#include "reply.h"

#include <json/value.h>

#include "orvel/error_state.h"
#include "text.h"

namespace orvel::cgi {
namespace {

std::string_view statusLine(Status status) {
    switch (status) {
        case Status::kOk:
            return "Status: 200 OK\r\n";
        case Status::kBadRequest:
            return "Status: 400 Bad Request\r\n";
        case Status::kNotLoggedIn:
            return "Status: 401 Unauthorized\r\n";
        case Status::kForbidden:
            return "Status: 403 Forbidden\r\n";
        case Status::kTooLarge:
            return "Status: 413 Content Too Large\r\n";
        case Status::kBroken:
            break;
    }
    return "Status: 500 Internal Server Error\r\n";
}

}  // namespace

void beginReply(Output& out, Status status, const std::string& cookie) {
    out.text() += statusLine(status);
    out.text() +=
        "Content-Type: application/json; charset=UTF-8\r\n"
        "X-Content-Type-Options: nosniff\r\n"
        "Cache-Control: no-store\r\n";
    if (!cookie.empty()) out.text() += "Set-Cookie: " + cookie + "\r\n";
    out.text() += "\r\n";
}

void replyFailure(Output& out, Status status, const std::string& cookie, int code, std::string_view path) {
    Json::Value reply;
    reply["success"] = false;
    Json::Value& error = reply["error"];
    error["code"] = code;
    error["key"] = OrvParseErrorToKTRString(code, nullptr);
    error["path"] = readable(path);
    if (!isUtf8(path)) error["path_raw"] = percentEncode(path);
    beginReply(out, status, cookie);
    appendJson(reply, out.text());
}

}  // namespace orvel::cgi
