#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <functional>

#include "chosen_rows.h"
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

// Calls `ask` with each name of the request until it fails.
int eachName(Operation& operation, const std::function<int(const std::string& name)>& ask) {
    int code = ORV_ERR_NONE;
    if (ChosenRows::isIn(operation.web)) {
        ChosenRows rows;
        code = rows.find(operation.user, operation.web);
        if (code != ORV_ERR_NONE) rows.explain(operation.data);
        for (size_t i = 0; i < rows.size() && code == ORV_ERR_NONE; ++i) {
            KeptRow row;
            code = rows.row(i, row);
            if (code == ORV_ERR_NONE) code = ask(row.name);
        }
        return code;
    }
    for (const std::string& line : linesParam(operation.web, "names_raw")) {
        const auto name = percentDecode(line);
        code = name && isName(*name) ? ask(*name) : static_cast<int>(ORV_ERR_PARAMETER);
        if (code != ORV_ERR_NONE) break;
    }
    return code;
}

int look(Operation& operation, const Descriptor& folder, const std::string& name, Json::Value& items) {
    struct stat status {};
    if (fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
        if (errno == ENOENT || errno == ENAMETOOLONG) return ORV_ERR_NONE;
        operation.culprit = operation.info.path + "/" + name;
        return OrvParseErrnoToError(errno, nullptr, nullptr);
    }
    Json::Value item;
    putPath(item, "name", name);
    item["isdir"] = S_ISDIR(status.st_mode);
    item["size"] = Json::Int64{status.st_size};
    item["mtime"] = Json::Int64{status.st_mtime};
    items.append(item);
    return ORV_ERR_NONE;
}

}  // namespace

int presentOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    Descriptor folder;
    int code = confinedOpen(info, linkPolicyOf(info.shareName), O_PATH | O_DIRECTORY, folder);
    if (code != ORV_ERR_NONE) return code;
    Json::Value items(Json::arrayValue);
    code = eachName(operation, [&](const std::string& name) { return look(operation, folder, name, items); });
    if (code == ORV_ERR_NONE) operation.data["items"] = items;
    return code;
}

}  // namespace orvel::cgi
