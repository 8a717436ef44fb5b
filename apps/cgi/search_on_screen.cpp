#include "search_on_screen.h"

#include <sys/stat.h>

#include <set>
#include <string_view>

#include "orvel/user_directory.h"
#include "vexo/share.h"
#include "vexo/stat.h"

namespace orvel::cgi {
namespace {

constexpr unsigned kBasicAndCreation = 1 | 8;

struct CloseShares {
    void operator()(VEXOSHAREDB* database) const { VEXOShareDBClose(database); }
};

// The first components of all share roots.
std::set<std::string> volumes() {
    std::set<std::string> found;
    const std::unique_ptr<VEXOSHAREDB, CloseShares> shares(VEXOShareDBOpen());
    PVEXOSHARE share = nullptr;
    while (shares != nullptr && VEXOShareDBCursorGet(shares.get(), &share) == 0) {
        const std::string root = share->szPath;
        found.insert(root.substr(0, root.find('/', 1)));
    }
    VEXOShareFree(share);
    return found;
}

// The path as results have it: no empty components, no "/" at its end.
std::string tidy(std::string_view path) {
    std::string out;
    for (const char c : path) {
        if (c != '/' || out.empty() || out.back() != '/') out += c;
    }
    if (out.size() > 1 && out.back() == '/') out.pop_back();
    return out;
}

bool readStatus(const std::string& path, _tag_VEXOSTAT_& status) {
    return VLIBCFileLStat(path.c_str(), kBasicAndCreation, &status) >= 0;
}

}  // namespace

SearchOnScreen::SearchOnScreen(const std::string& user, const std::string& taskId) {
    if (taskId.empty()) return;
    const FileSearch::OrvSearchDBTaskMgr manager(user.c_str());
    for (const std::string& volume : volumes()) {
        if (!manager.hasDBTask(volume.c_str(), taskId.c_str())) continue;
        task_.reset(manager.getDBTask(volume.c_str(), taskId.c_str()));
        return;
    }
}

void SearchOnScreen::removed(const PathInfo& gone) {
    if (task_ != nullptr) task_->delRecs(gone.shareName, tidy(gone.realPath));
}

void SearchOnScreen::added(const PathInfo& made) {
    const std::string path = tidy(made.realPath);
    _tag_VEXOSTAT_ status = {};
    if (task_ == nullptr || !readStatus(path, status)) return;
    OrvelUserEnum names;
    task_->insertFile(made.shareName, path, names.GetUserNameByUID(status.st_uid),
                      names.GetGroupNameByGID(status.st_gid), status);
}

void SearchOnScreen::moved(const PathInfo& from, const PathInfo& to) {
    const std::string oldPath = tidy(from.realPath), newPath = tidy(to.realPath);
    _tag_VEXOSTAT_ status = {};
    if (task_ == nullptr || !readStatus(newPath, status)) return;
    task_->updateFile(from.shareName, oldPath, to.shareName, newPath, status);
    if (S_ISDIR(status.st_mode)) task_->updateFileInFolder(from.shareName, oldPath, to.shareName, newPath);
}

}  // namespace orvel::cgi
