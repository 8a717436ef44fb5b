// The chosen folders, grouped by share.
#include <fcntl.h>

#include <cerrno>
#include <utility>

#include "base/beneath.h"
#include "core/acl_privilege.h"
#include "core/boundary.h"
#include "enum/folder_entry.h"
#include "orvel/privilege.h"
#include "orvel/search_walker.h"
#include "orvel/share_path.h"
#include "search/share_address.h"
#include "vexo/share.h"

namespace FileSearch {
namespace {

// A home folder as what it is on disk, a folder of the share that holds the homes: so that the records of a walk, the
// conditions for the index and the index's own records name the same share, root and path.
// Where homes are in no share, the home itself stands for that share's root.
void moveToHomes(const std::string& user, PathInfo& info) {
    info.shareName = orvel::kHomesShare;
    const std::string root = orvel::rootAbove(info.shareName, user, info.shareRoot);
    std::size_t within = info.shareRoot.size() + 1;
    if (root != info.shareRoot && orvel::splitRealPath(info.shareRoot, root, within) != PathFault::kNone) return;
    info.path = "/" + info.shareName;
    if (info.realPath.size() >= within) info.path += "/" + info.realPath.substr(within);
    info.shareRoot.resize(within - 1);
}

// Opens the folder, which must lie beneath its share's root, as a place. Null when it cannot be listed, logged.
orvel::Descriptor openChosen(const PathInfo& info) {
    using namespace orvel;
    const Descriptor root(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    const std::string path = pathBelow(info.shareRoot, info.realPath);
    Descriptor place = root ? openBeneath(root, path, LinkPolicy::kInside, O_PATH | O_DIRECTORY) : Descriptor();
    if (!place) reportUnlistable(info.realPath, failedStep(errno), errno);
    return place;
}

}  // namespace

bool SearchShareDirMap::insertDir(const char* user, const char* sid, const std::string& folder) {
    return orvel::guardedQuietly(false, [&] {
        if (!CheckShareListPrivilege(user, sid, folder.c_str())) return true;
        PathInfo info;
        if (!PathInfoFactory::create(user, folder, info)) return false;
        if (VEXOShareIsShareRecycle(info.realPath.c_str()) == 1) return true;
        orvel::Descriptor place = openChosen(info);
        orvel::FolderIdentity identity{};
        if (!place || !orvel::identify(place.get(), identity)) return true;
        if (!orvel::mayListFolder(orvel::GivenFolder(std::move(place), info.realPath))) return true;
        if (IsDirUserHome(info.shareName, nullptr)) moveToHomes(user, info);
        marks_[info.shareName].push_back({identity.device, identity.inode});
        shares_[info.shareName].push_back(info);
        return true;
    });
}

const FileMark& SearchShareDirMap::markOf(const std::string& share, std::size_t position) const {
    return marks_.at(share).at(position);
}

const std::vector<PathInfo>* SearchShareDirMap::findShare(const std::string& share) const {
    const auto found = shares_.find(share);
    return found == shares_.end() ? nullptr : &found->second;
}

}  // namespace FileSearch
