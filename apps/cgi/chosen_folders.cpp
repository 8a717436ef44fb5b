#include "chosen_folders.h"

#include <algorithm>
#include <set>

#include "confined.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "temporary_folder.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"

namespace orvel::cgi {
namespace {

int chooseFolder(const User& user, const std::string& path, PathInfo& info, std::string& folder) {
    const char* sid = user.sid.empty() ? nullptr : user.sid.c_str();
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, info)) return lastCode();
    if (!CheckShareListPrivilege(user.name.c_str(), sid, info.path.c_str())) return ORV_ERR_DENIED;
    Descriptor opened;  // the library opens it again beneath the root and notes which it is
    std::string realPath;
    const int code = confinedFolder(info, linkPolicyOf(info.shareName), opened, realPath);
    if (code != ORV_ERR_NONE) return code;
    folder = "/" + definedShareName(info.shareName) + realPath.substr(info.shareRoot.size());
    return ORV_ERR_NONE;
}

std::optional<UsedIndex> indexOf(const std::string& share) {
    UsedIndex index;
    int live = 0;
    if (FILEIDXIsIndexEnable(share.c_str()) != 1) return std::nullopt;
    if (FILEIDXIndexAsOf(share.c_str(), &index.updated, &live) == 0) index.live = live != 0;
    return index;
}

}  // namespace

int chooseFolders(const User& user, const std::vector<std::string>& paths, std::vector<std::string>& folders,
                  std::string& culprit) {
    std::set<std::string> volumes;
    for (const std::string& path : paths) {
        PathInfo info;
        std::string folder;
        const int code = chooseFolder(user, path, info, folder);
        if (code == ORV_ERR_NONE) {
            folders.push_back(folder);
            volumes.insert(info.volumePath);
        } else if (code != ORV_ERR_DENIED) {
            culprit = path;
            return code;
        }
    }
    // The results go to one of them; where that does not work the search itself says so.
    for (const std::string& volume : volumes) static_cast<void>(openTemporaryFolder(volume));
    if (!folders.empty()) return ORV_ERR_NONE;
    culprit = paths.empty() ? "" : paths.front();
    return ORV_ERR_DENIED;
}

std::map<std::string, std::optional<UsedIndex>> searchedShares(const std::vector<std::string>& folders) {
    std::map<std::string, std::optional<UsedIndex>> shares;
    for (const std::string& folder : folders) {
        const bool home = IsDirUserHome(folder, nullptr);
        const std::string share = home ? "homes" : folder.substr(1, folder.find('/', 1) - 1);
        if (shares.find(share) == shares.end()) shares[share] = indexOf(share);
    }
    return shares;
}

std::vector<std::string> foldersWithoutMounts(const std::string& user, const std::vector<std::string>& folders) {
    std::vector<std::string> found;
    const auto shares = searchedShares(folders);
    for (const std::string& folder : folders) {
        PathInfo info;
        if (!PathInfoFactory::create(user.c_str(), folder, info)) continue;
        const auto share = shares.find(IsDirUserHome(folder, nullptr) ? "homes" : info.shareName);
        if (share == shares.end() || !share->second) continue;
        const bool isWalked = VEXOFSIsRemoteFS(VEXOGetFSType(info.realPath.c_str(), 0)) == 1;
        if (!isWalked && VEXOFSHasRemoteBelow(info.realPath.c_str()) == 1) found.push_back(folder);
    }
    return found;
}

bool anyHome(const std::vector<std::string>& paths) {
    return std::any_of(paths.begin(), paths.end(),
                       [](const std::string& path) { return IsDirUserHome(path, nullptr); });
}

}  // namespace orvel::cgi
