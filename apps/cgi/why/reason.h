// What decides about a user's access to a path, as replies show it.
#ifndef ORVEL_CGI_WHY_REASON_H
#define ORVEL_CGI_WHY_REASON_H

#include <json/value.h>

#include <string>

#include "orvel/privilege_reason.h"
#include "request.h"

namespace orvel::cgi {

// {"share","rule","privilege","administrator","restrictions","remote","read_only","exists","permissions"}: see the
// program "why". The process acts as the user. False, with the library's error set, when it cannot be determined.
[[nodiscard]] bool explainAccess(const std::string& path, const User& user, Json::Value& data);

// "home", "no_access", "read_write", "read_only", "no_list" or "service".
const char* ruleWord(PrivilegeRule rule);

}  // namespace orvel::cgi

#endif
