// What a page needs beside a listing, in the same request.
#ifndef ORVEL_CGI_LIST_BESIDE_H
#define ORVEL_CGI_LIST_BESIDE_H

#include <string>

#include "output.h"
#include "request.h"

namespace orvel::cgi {

// Appends the member ,"with":{...} of the data, if "with" asks for it. Its words, separated by commas, are those of its
// members: "preferences", "tasks" and "uploads", the data of the programs "preferences" (get), "operation" (status) and
// "tus" (GET); "access", that of "why" about `path`; "links": {"items":[{"path"}],"total"}, what lies in `path` and has
// a public link of the user's, and how many links that user has; "above": {"folders":[{"path","items"}]}, the folders
// above `path` with their sub-folders. One that cannot be had is missing, and unknown words ask for nothing. The
// process acts as the user.
void appendBeside(const Request& request, const std::string& path, Output& out);

}  // namespace orvel::cgi

#endif
