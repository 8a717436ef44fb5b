// What the library says about a path before anything is done there.
#ifndef ORVEL_CGI_OPERATION_JUDGE_H
#define ORVEL_CGI_OPERATION_JUDGE_H

#include <string>

#include "request.h"

namespace orvel::cgi {

enum class Need { kList, kRead, kCreate, kModify };

// The share's rule for the share-relative `path`; below a home folder the file system alone decides. 0 or a library
// code.
int judge(const User& user, const std::string& path, Need need);

}  // namespace orvel::cgi

#endif
