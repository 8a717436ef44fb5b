// The names in a folder that is open.
#ifndef ORVEL_CGI_FOLDER_NAMES_H
#define ORVEL_CGI_FOLDER_NAMES_H

#include <string>
#include <vector>

namespace orvel::cgi {

enum class Hidden { kLeaveOut, kInclude };

// Puts the names in `folder`, in byte order, into `names`; those that the file manager never shows only when asked for.
// False with errno when not all could be read.
bool namesIn(int folder, Hidden hidden, std::vector<std::string>& names);

}  // namespace orvel::cgi

#endif
