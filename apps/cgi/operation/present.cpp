#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "confined.h"
#include "operation/operation.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "text.h"

namespace orvel::cgi {
namespace {

bool isName(const std::string& text) {
    return !text.empty() && text != "." && text != ".." && text.find('/') == std::string::npos;
}

}  // namespace

int presentOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    Descriptor folder;
    const int code = confinedOpen(info, linkPolicyOf(info.shareName), O_PATH | O_DIRECTORY, folder);
    if (code != ORV_ERR_NONE) return code;
    Json::Value items(Json::arrayValue);
    for (const std::string& line : linesParam(operation.web, "names_raw")) {
        const auto name = percentDecode(line);
        if (!name || !isName(*name)) return ORV_ERR_PARAMETER;
        struct stat status {};
        if (fstatat(folder.get(), name->c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
            if (errno == ENOENT || errno == ENAMETOOLONG) continue;
            operation.culprit = info.path + "/" + *name;
            return OrvParseErrnoToError(errno, nullptr, nullptr);
        }
        Json::Value item;
        putPath(item, "name", *name);
        item["isdir"] = S_ISDIR(status.st_mode);
        item["size"] = Json::Int64{status.st_size};
        item["mtime"] = Json::Int64{status.st_mtime};
        items.append(item);
    }
    operation.data["items"] = items;
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
