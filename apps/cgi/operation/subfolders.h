// The sub-folders of a folder, as replies show them.
#ifndef ORVEL_CGI_OPERATION_SUBFOLDERS_H
#define ORVEL_CGI_OPERATION_SUBFOLDERS_H

#include <json/value.h>

#include <string>

#include "base/descriptor.h"
#include "request.h"

namespace orvel::cgi {

// [{"name","path","mtime","mount_type"}] by name, of the open folder that is called `path`; "mount_type" only for mount
// points. 0 or a library code.
int subfoldersOf(const Descriptor& folder, const std::string& path, Json::Value& items);

// [{"path","items"}] of the folders above `path`, from the share's root on, with their sub-folders as above. One that
// the user may not list, or that would take long to read, is left out.
Json::Value subfoldersAbove(const User& user, const std::string& path);

}  // namespace orvel::cgi

#endif
