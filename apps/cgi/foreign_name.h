// Names of files in encodings that nobody says. Pure.
#ifndef ORVEL_CGI_FOREIGN_NAME_H
#define ORVEL_CGI_FOREIGN_NAME_H

#include <string>
#include <string_view>

namespace orvel::cgi {

// A name that is no UTF-8, in UTF-8: as Shift-JIS where it reads like Japanese, else as code page 437, which every byte
// is a character of. Archives of both kinds are common, and none says which it is.
std::string foreignName(std::string_view bytes);

}  // namespace orvel::cgi

#endif
