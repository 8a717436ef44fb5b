#include "share/place.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "confined.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "reply.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

std::string lastComponent(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

// What follows the slashes at the front; "" also for ".".
std::string relative(const std::string& wanted) {
    return wanted.substr(std::min(wanted.find_first_not_of('/'), wanted.size()));
}

}  // namespace

int findPlace(const std::string& owner, const std::string& sharedPath, const std::string& wanted, Place& place) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(owner.c_str(), sharedPath, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    if (!CheckShareDownloadPrivilege(owner.c_str(), nullptr, info.path.c_str())) return lastCode(ORV_ERR_DENIED);

    // What was deleted was taken back from visitors, too.
    if (VEXOShareHideBin(info.shareRoot.c_str()) != 0) return refusalCode(errno, info.realPath);

    // The path was free of links when it was published; one that took a place in it since would show something else.
    Descriptor shared;
    const int code = confinedOpen(info, LinkPolicy::kNone, O_PATH, shared);
    if (code != ORV_ERR_NONE) return code;
    struct stat status = {};
    if (fstat(shared.get(), &status) != 0) return refusalCode(errno, info.realPath);
    place.isFile = !S_ISDIR(status.st_mode);
    const std::string rest = relative(wanted), top = realPathOf(shared);
    if (place.isFile && !rest.empty()) return ORV_ERR_MISSING;

    const auto below = pathInShare(info, shared);
    if (rest.empty()) {
        place.found = std::move(shared);
    } else {
        const Descriptor root(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        if (!root) return refusalCode(errno, info.shareRoot);
        const int inside =
            openShown(root, shared, rest, linkPolicyOf(info.shareName), O_PATH, info.realPath, place.found);
        if (inside != ORV_ERR_NONE) return inside;
    }
    place.realPath = realPathOf(place.found);
    if (!below || top.empty() || !place.realPath.starts_with(top)) return ORV_ERR_DENIED;
    place.within = place.realPath.substr(top.size());
    place.path = "/" + info.shareName + *below + place.within;
    place.name = lastComponent(place.path);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
