// What lies in a folder and has a public link.
#ifndef ORVEL_CGI_LINK_WITHIN_H
#define ORVEL_CGI_LINK_WITHIN_H

#include <json/value.h>

#include <string>

namespace orvel::cgi {

// {"items":[{"path"}],"total"}: what lies directly in `folder` and has a link of the user's, and how many links the
// user has. False when they cannot be read.
[[nodiscard]] bool linksWithin(const std::string& user, const std::string& folder, Json::Value& data);

}  // namespace orvel::cgi

#endif
