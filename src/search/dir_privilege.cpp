// Which folders of a share a walk of the calling identity would read.
#include <fcntl.h>
#include <unistd.h>

#include "core/boundary.h"
#include "core/owned.h"
#include "orvel/search_walker.h"
#include "search/share_address.h"

namespace FileSearch {

DirPrivilegeMap::DirPrivilegeMap(const std::string& shareRoot, const std::vector<PathInfo>& chosen) : root_(-1) {
    for (const PathInfo& folder : chosen) chosen_.emplace(orvel::pathWithinShare(folder.path));
    root_ = open(shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
}

DirPrivilegeMap::~DirPrivilegeMap() {
    if (root_ >= 0) close(root_);
}

// From the nearest folder above that is decided, or chosen, down to the folder asked about.
bool DirPrivilegeMap::findDirPrivilege(std::string_view folder) {
    return orvel::guardedQuietly(false, [&] {
        std::vector<std::string_view> undecided;
        bool verdict = false;
        for (std::string_view at = folder;;) {
            if (const auto known = verdicts_.find(at); known != verdicts_.end()) {
                verdict = known->second;
                break;
            }
            undecided.push_back(at);
            if (chosen_.contains(at)) {
                verdict = true;
                break;
            }
            if (at.empty()) break;
            const std::size_t slash = at.rfind('/');
            at = at.substr(0, slash == std::string_view::npos ? 0 : slash);
        }
        for (; !undecided.empty(); undecided.pop_back()) {
            verdict = verdict && canWalk(undecided.back());
            verdicts_.emplace(undecided.back(), verdict);
        }
        return verdict;
    });
}

// What a walk needs is permission to read the folder and to search it; the "." behind its name asks for the latter. No
// link is followed, and the path may be longer than the kernel takes in one piece.
bool DirPrivilegeMap::canWalk(std::string_view folder) const {
    constexpr int kFolder = O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    orvel::Descriptor place;
    while (!folder.empty()) {
        const std::size_t end = std::min(folder.find('/'), folder.size());
        const std::string name(folder.substr(0, end));
        place = orvel::Descriptor(openat(place ? place.get() : root_, name.c_str(), O_PATH | kFolder));
        if (!place) return false;
        folder.remove_prefix(std::min(end + 1, folder.size()));
    }
    const orvel::Descriptor opened(openat(place ? place.get() : root_, ".", O_RDONLY | O_NONBLOCK | kFolder));
    return static_cast<bool>(opened);
}

}  // namespace FileSearch
