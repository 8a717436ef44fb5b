// The actions of the program "operation". Each answers 0 or a library code, and fills `data` of the reply.
#ifndef ORVEL_CGI_OPERATION_OPERATION_H
#define ORVEL_CGI_OPERATION_OPERATION_H

#include <json/value.h>

#include <string>

#include "orvel/file_info.h"
#include "request.h"
#include "vexo/web.h"

namespace orvel::cgi {

struct Operation {
    const User& user;
    const VEXO::WebCGI& web;
    std::string path;  // share-relative
    PathInfo info;     // what it resolved to
    Json::Value data;
};

// "parents" = "true": missing folders above are made, too. data: {"path"}.
int makeFolderOperation(Operation& operation);
// "name" or "name_raw": the new name, in the same folder. data: {"path"}, the new one.
int renameOperation(Operation& operation);
// data: {"items":[{"name","path","mtime","mount_type"}]}, the sub-folders by name, "mount_type" only for mount points.
int subfoldersOperation(Operation& operation);

}  // namespace orvel::cgi

#endif
