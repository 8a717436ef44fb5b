// Renaming that replaces nothing.
#ifndef ORVEL_CGI_OPERATION_RENAME_NEW_H
#define ORVEL_CGI_OPERATION_RENAME_NEW_H

#include <string>

namespace orvel::cgi {

// Gives `from` in the open folder `fromFolder` the name `to` in `toFolder`. False with errno, EEXIST when there is such
// a name already; one that is the same file by another spelling (where case does not count) is no obstacle.
bool renameNew(int fromFolder, const std::string& from, int toFolder, const std::string& to);

}  // namespace orvel::cgi

#endif
