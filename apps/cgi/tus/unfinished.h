// A user's uploads that are not over, as replies show them.
#ifndef ORVEL_CGI_TUS_UNFINISHED_H
#define ORVEL_CGI_TUS_UNFINISHED_H

#include <json/value.h>

#include "request.h"

namespace orvel::cgi {

// {"items":[{"id","path","size","offset","mtime","conflict","created","expires"}]}, oldest first. The process acts as
// the user.
Json::Value unfinishedReply(const User& user);

}  // namespace orvel::cgi

#endif
