#include "link_making.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <limits>

#include "confined.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "orvel/sharing_settings.h"
#include "reply.h"
#include "request.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr std::int64_t kDay = 86400;

// May the user, as whom the process acts, download the path? It must be there. Published is where it leads now: links
// and ".." in it could lead elsewhere later, to what the user never meant to show.
int judgePath(const LinkWish& wish, std::string& path) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(wish.user.c_str(), wish.path, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    const char* sid = wish.sid.empty() ? nullptr : wish.sid.c_str();
    if (!CheckShareDownloadPrivilege(wish.user.c_str(), sid, info.path.c_str())) return lastCode(ORV_ERR_DENIED);
    Descriptor found;
    const int code = confinedOpen(info, linkPolicyOf(info.shareName), O_RDONLY | O_NONBLOCK | O_NOCTTY, found);
    if (code != ORV_ERR_NONE) return code;
    struct stat status = {};
    if (fstat(found.get(), &status) != 0) return refusalCode(errno, info.realPath);
    if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return ORV_ERR_DENIED;
    const auto within = pathInShare(info, found);
    if (!within) return ORV_ERR_MISSING;
    path = "/" + info.shareName + *within;
    return ORV_ERR_NONE;
}

// From 1970 on, with a day's room above.
bool isDate(std::int64_t seconds) {
    return seconds >= 0 && seconds <= std::numeric_limits<std::int64_t>::max() - kDay;
}

}  // namespace

int makeLink(const LinkWish& wish, Link& link) {
    // Asked while still root: whether an account has ended stands where only root reads.
    if (OrvLibUserPrivForSharing(wish.user.c_str()) != 1) return ORV_ERR_DENIED;
    gid_t gid = 0;
    const bool keepable = wish.user.find_first_of(",\r\n") == std::string::npos;
    if (!keepable || VEXOUserGetUGID(wish.user.c_str(), &link.uid, &gid) != 0) return ORV_ERR_PARAMETER;
    if (!isDate(wish.available) || !isDate(wish.expires)) return ORV_ERR_PARAMETER;
    // Without an end the begin would not count.
    if (wish.available > 0 && (wish.expires == 0 || wish.expires + kDay <= wish.available)) return ORV_ERR_PARAMETER;
    int code = actAs(wish.sid.empty() ? nullptr : wish.sid.c_str(), wish.user, IsDirUserHome(wish.path, nullptr));
    if (code == ORV_ERR_NONE) code = judgePath(wish, link.path);
    if (code != ORV_ERR_NONE) return code;
    link.owner = wish.user;
    link.available = wish.available;
    link.expires = wish.expires;
    if (wish.password.size() > kLongestPassword) return ORV_ERR_PARAMETER;
    if (!wish.password.empty()) {
        link.passwordHash = hashPassword(wish.password);
        if (link.passwordHash.empty()) return ORV_ERR_GENERAL;
    }
    LinkStore store;
    return store.add(link) ? ORV_ERR_NONE : ORV_ERR_GENERAL;
}

}  // namespace orvel::cgi
