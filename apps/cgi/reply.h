// The replies of every program: JSON, never cached, never guessed to be something else.
//
// {"success":true,"data":...} or {"success":false,"error":{"code","key","path"}}, "code" a library code and "key" its
// message key. A path that is no UTF-8 is shown readable, with "path_raw", its bytes percent-encoded, beside it.
#ifndef ORVEL_CGI_REPLY_H
#define ORVEL_CGI_REPLY_H

#include <json/forwards.h>

#include <string>
#include <string_view>

#include "orvel/error_state.h"
#include "output.h"

namespace orvel::cgi {

// The HTTP status tells whether the request could be carried out at all; an operation that was tried and refused by the
// library is a served request (200) whose JSON says why.
enum class Status {
    kOk = 200,
    kBadRequest = 400,
    kNotLoggedIn = 401,
    kForbidden = 403,
    kNotFound = 404,
    kMethodNotAllowed = 405,
    kGone = 410,
    kChanged = 412,
    kTooLarge = 413,
    kUnsupportedType = 415,
    kTooMany = 429,
    kBroken = 500,
    kBusy = 503
};

// Writes the header. `cookie` is the value of a Set-Cookie line, "" for none.
void beginReply(Output& out, Status status, const std::string& cookie);

// The whole reply: of a success when `code` is 0, else of the failure with that library code at `path`. Either way with
// `data` unless it is null: what a request did before it failed.
void reply(Output& out, Status status, const std::string& cookie, int code, std::string_view path,
           const Json::Value& data);
void replyFailure(Output& out, Status status, const std::string& cookie, int code, std::string_view path);

// The same for a failure that is a program's own: `key` names its text.
void replyOwnFailure(Output& out, Status status, const std::string& cookie, int code, const char* key,
                     std::string_view path, const Json::Value& data);

// The library code of the failure just met, `fallback` where it set none (store 0 before the call).
int lastCode(int fallback = ORV_ERR_GENERAL);

// The library code for the platform's last failure.
int platformCode();

// Sets `key` to `path`, readable, and where it is no UTF-8 `key` + "_raw" to its bytes, percent-encoded.
void putPath(Json::Value& object, const char* key, std::string_view path);

}  // namespace orvel::cgi

#endif
