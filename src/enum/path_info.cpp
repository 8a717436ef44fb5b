#include <syslog.h>

#include <string>

#include "base/printable.h"
#include "core/boundary.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/share_path.h"
#include "vexo/error.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelenum";

int platformErrorOf(int code) {
    switch (code) {
        case ORV_ERR_PARAMETER:
            return VEXO_ERR_PARAMETER;
        case ORV_ERR_MISSING:
            return VEXO_ERR_PATH_MISSING;
        default:
            return VEXO_ERR_PATH;
    }
}

// A path made of slashes alone is kept.
void trimSlashes(std::string& path) {
    const size_t last = path.find_last_not_of('/');
    if (last != std::string::npos) path.erase(last + 1);
}

bool refuse() {
    OrvLibSetErr(ORV_ERR_PARAMETER);
    VLIBCErrSetEx(VEXO_ERR_PARAMETER, kSource, __LINE__);
    return false;
}

bool resolveInfo(const char* user, const std::string& path, PathInfo& info) {
    if (user == nullptr || path.empty()) return refuse();
    info.path = path;
    trimSlashes(info.path);
    if (OrvFullPathGet(info.path.c_str(), info.realPath, info.shareName, info.volumePath, info.shareRoot, user) != 0) {
        return true;
    }
    VLIBCErrSetEx(platformErrorOf(OrvLibGetErr()), kSource, __LINE__);
    syslog(LOG_ERR, "%s:%d Fail to get the Full Path, %s", kSource, __LINE__, printable(path).c_str());
    return false;
}

}  // namespace
}  // namespace orvel

bool PathInfoFactory::create(const char* user, const std::string& path, PathInfo& info) {
    return orvel::guarded(false, [&] { return orvel::resolveInfo(user, path, info); });
}
