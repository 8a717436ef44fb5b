// The volume's folder for temporary files, in which everybody may write.
#ifndef ORVEL_CGI_TEMPORARY_FOLDER_H
#define ORVEL_CGI_TEMPORARY_FOLDER_H

#include <string>

#include "base/descriptor.h"

namespace orvel::cgi {

// Opens "@tmp/orvel" of a volume, made where it is missing, as root where the process may become root. Both folders are
// made sticky (01777), so that nobody removes or renames what another one keeps there: call it before OrvCreateTmpDir,
// which leaves a folder as it finds it. No link is followed, and a folder that belongs neither to root nor to the
// caller is not used: an "orvel" of that kind is moved out of the way, where the process may become root. Null with
// errno.
Descriptor openTemporaryFolder(const std::string& volumePath);

// Opens the folder `name` in an open temporary folder, made where it is missing, which is the caller's alone (0700).
// What somebody else has put under the name is moved out of the way, where the process may become root. Null with
// errno.
Descriptor openOwnFolder(const Descriptor& temporary, const std::string& name);

}  // namespace orvel::cgi

#endif
