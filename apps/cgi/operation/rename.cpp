#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <optional>

#include "operation/operation.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "orvel/name_check.h"
#include "reply.h"
#include "shown_search.h"
#include "target.h"
#include "text.h"

namespace orvel::cgi {
namespace {

std::optional<std::string> nameParam(const VEXO::WebCGI& web) {
    if (web.HasParam("name_raw")) return percentDecode(web.GetParam("name_raw", ""));
    const std::string name = web.GetParam("name", "");
    if (name.find('\0') != std::string::npos) return std::nullopt;
    return name;
}

bool isSameFile(int folder, const std::string& a, const std::string& b) {
    struct stat first {
    }, second{};
    return fstatat(folder, a.c_str(), &first, AT_SYMLINK_NOFOLLOW) == 0 &&
           fstatat(folder, b.c_str(), &second, AT_SYMLINK_NOFOLLOW) == 0 && first.st_dev == second.st_dev &&
           first.st_ino == second.st_ino && (S_ISDIR(first.st_mode) || first.st_nlink == 1);
}

// Never replaces anything. Where case does not count (FAT), the new name may be the old file itself.
bool renameIn(int folder, const std::string& from, const std::string& to) {
    if (renameat2(folder, from.c_str(), folder, to.c_str(), RENAME_NOREPLACE) == 0) return true;
    struct stat status {};
    const bool unsupported = errno == EINVAL && fstatat(folder, to.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0;
    const bool itself = errno == EEXIST && isSameFile(folder, from, to);
    if (!unsupported && !itself) return false;
    return renameat(folder, from.c_str(), folder, to.c_str()) == 0;
}

}  // namespace

int renameOperation(Operation& operation) {
    const PathInfo& info = operation.info;
    const auto name = nameParam(operation.web);
    if (!name) return ORV_ERR_PARAMETER;
    Target target;
    const int code = openTarget(info, linkPolicyOf(info.shareName), operation.user.name, Missing::kRefuse, target);
    if (code != ORV_ERR_NONE) return code;
    OrvLibSetErr(ORV_ERR_NONE);
    if (OrvCheckFileName(realPathOf(target.folder).c_str(), name->c_str()) != 0) return lastCode(ORV_ERR_GENERAL);
    if (!renameIn(target.folder.get(), target.name, *name)) {
        return OrvParseErrnoToError(errno, info.shareName.c_str(), info.realPath.c_str());
    }
    OrvLibDoLog(operation.user.name, info.path, 0, ORVEL_ACTION_RENAME, false);
    ShownSearch(operation.user.name, operation.web.GetParam("taskid", ""))
        .moved({info, target.folder, target.name}, {info, target.folder, *name});
    putPath(operation.data, "path", info.path.substr(0, info.path.rfind('/') + 1) + *name);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
