// The chosen folders, grouped by share.
#include "core/boundary.h"
#include "orvel/privilege.h"
#include "orvel/search_walker.h"
#include "orvel/share_path.h"
#include "search/share_address.h"
#include "vexo/share.h"

namespace FileSearch {
namespace {

// A home folder as what it is on disk, a folder of the share that holds the homes: so that the records of a walk, the
// conditions for the index and the index's own records name the same share, root and path.
void moveToHomes(PathInfo& info) {
    info.shareName = orvel::kHomesShare;
    std::size_t within = 0;
    if (orvel::splitRealPath(info.shareRoot, within) != PathFault::kNone) return;
    info.path = "/" + info.shareName + "/" + info.realPath.substr(within);
    info.shareRoot.resize(within - 1);
}

}  // namespace

bool SearchShareDirMap::insertDir(const char* user, const char* sid, const std::string& folder) {
    return orvel::guardedQuietly(false, [&] {
        if (!CheckShareListPrivilege(user, sid, folder.c_str())) return true;
        PathInfo info;
        if (!PathInfoFactory::create(user, folder, info)) return false;
        if (VEXOShareIsShareRecycle(info.realPath.c_str()) == 1) return true;
        if (!CheckDirListPrivilege(info.realPath.c_str())) return true;
        if (IsDirUserHome(info.shareName, nullptr)) moveToHomes(info);
        shares_[info.shareName].push_back(info);
        return true;
    });
}

const std::vector<PathInfo>* SearchShareDirMap::findShare(const std::string& share) const {
    const auto found = shares_.find(share);
    return found == shares_.end() ? nullptr : &found->second;
}

}  // namespace FileSearch
