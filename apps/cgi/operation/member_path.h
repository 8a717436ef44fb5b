// Names in archives, which anybody can have made. Pure.
#ifndef ORVEL_CGI_OPERATION_MEMBER_PATH_H
#define ORVEL_CGI_OPERATION_MEMBER_PATH_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace orvel::cgi {

// The components of a member's name; nothing for one that leads anywhere but down: absolute, with "..", or without any
// component.
std::optional<std::vector<std::string>> memberComponents(std::string_view name);

// Whether a link with this text, `depth` folders below the top, leads to somewhere below the top whatever other such
// links there are: it is relative, and climbs only at its beginning, and not above the top.
bool staysInside(std::string_view linkText, std::size_t depth);

}  // namespace orvel::cgi

#endif
