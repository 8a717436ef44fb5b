// The replies of every program: JSON, never cached, never guessed to be something else.
//
// {"success":true,"data":...} or {"success":false,"error":{"code","key","path"}}, "code" a library code and "key" its
// message key. A path that is no UTF-8 is shown readable, with "path_raw", its bytes percent-encoded, beside it.
#ifndef ORVEL_CGI_REPLY_H
#define ORVEL_CGI_REPLY_H

#include <string>
#include <string_view>

#include "output.h"

namespace orvel::cgi {

// The HTTP status tells whether the request could be carried out at all; an operation that was tried and refused by the
// library is a served request (200) whose JSON says why.
enum class Status {
    kOk = 200,
    kBadRequest = 400,
    kNotLoggedIn = 401,
    kForbidden = 403,
    kTooLarge = 413,
    kBroken = 500
};

// Writes the header. `cookie` is the value of a Set-Cookie line, "" for none.
void beginReply(Output& out, Status status, const std::string& cookie);

// The whole reply of a failure.
void replyFailure(Output& out, Status status, const std::string& cookie, int code, std::string_view path);

}  // namespace orvel::cgi

#endif
