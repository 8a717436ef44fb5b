#include "target.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <string_view>
#include <vector>

#include "base/new_file.h"
#include "orvel/error_state.h"
#include "orvel/name_check.h"
#include "reply.h"
#include "snapshots.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr mode_t kFolderMode = 0777;  // less the umask, or what a default ACL says

std::vector<std::string> componentsOf(std::string_view path) {
    std::vector<std::string> components;
    while (!path.empty()) {
        const size_t end = std::min(path.find('/'), path.size());
        const std::string_view component = path.substr(0, end);
        if (!component.empty() && component != ".") components.emplace_back(component);
        path.remove_prefix(std::min(end + 1, path.size()));
    }
    return components;
}

std::string joined(const std::vector<std::string>& components, size_t count) {
    std::string path = ".";
    for (size_t i = 0; i < count; ++i) path += "/" + components[i];
    return path;
}

// What the share says of new folders. An administrator's process is root: what it makes is handed to the
// administrator's own account.
bool giveNew(const Descriptor& folder, const Descriptor& made, const std::string& user) {
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
    if (geteuid() == 0 && VEXOUserGetUGID(user.c_str(), &uid, &gid) != 0) uid = gid = static_cast<uid_t>(-1);
    return VEXOShareGiveNew(folder.get(), made.get(), kFolderMode, 0, uid, gid) == 0;
}

// Removes what did not become of a folder; the code for errno.
int takeBack(const Descriptor& folder, const std::string& name) {
    const int error = errno;
    unlinkat(folder.get(), name.c_str(), AT_REMOVEDIR);
    return OrvParseErrnoToError(error, nullptr, nullptr);
}

// It has its owner before it has its name.
int makeFolderFor(const std::string& user, const Descriptor& folder, const std::string& name, Descriptor& made) {
    std::string part;
    made = makeFolderPart(folder.get(), name, kFolderMode, part);
    if (!made) return OrvParseErrnoToError(errno, nullptr, nullptr);
    if (!giveNew(folder, made, user)) return takeBack(folder, part);
    if (renameNew(folder.get(), part, folder.get(), name)) return ORV_ERR_NONE;
    made.reset();
    return takeBack(folder, part);
}

// The folders above a target, of which the first `existing` ones exist.
struct Way {
    Descriptor root;
    std::vector<std::string> folders;
    size_t existing = 0;
};

// Cuts the path into the target's name and the folders above it, and opens the deepest of them that exists.
int enter(const PathInfo& info, LinkPolicy policy, Way& way, Target& target) {
    way.folders = componentsOf(std::string_view(info.realPath).substr(info.shareRoot.size()));
    target.name = info.realPath.substr(info.realPath.rfind('/') + 1);
    if (way.folders.empty()) return ORV_ERR_PARAMETER;
    // These are names of folders above, not of anything that could be made.
    if (target.name == "." || target.name == "..") return ORV_ERR_RESERVED_NAME;
    if (info.realPath.size() >= PATH_MAX) return refusalCode(ENAMETOOLONG, info.realPath);  // could not be opened again
    way.folders.pop_back();

    way.root = Descriptor(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!way.root) return refusalCode(errno, info.shareRoot);
    for (way.existing = way.folders.size();; --way.existing) {
        target.folder = openBeneath(way.root, joined(way.folders, way.existing), policy, O_PATH | O_DIRECTORY);
        if (target.folder) return isHiddenPlace(way.root, target.folder) ? ORV_ERR_RESERVED_NAME : ORV_ERR_NONE;
        if (errno != ENOENT || way.existing == 0) return refusalCode(errno, info.realPath);
    }
}

}  // namespace

int checkNewName(const Descriptor& folder, const std::string& name) {
    VEXOShareNamesOf(folder.get());
    if (VEXOEAIsHiddenFile(name.c_str()) != 0) return ORV_ERR_RESERVED_NAME;
    if (isInSnapshot(folder, name)) return ORV_ERR_READ_ONLY;
    OrvLibSetErr(ORV_ERR_NONE);
    return OrvCheckFileName(realPathOf(folder).c_str(), name.c_str()) == 0 ? ORV_ERR_NONE : lastCode();
}

std::string folderIdentity(int folder) {
    struct statx status {};
    if (statx(folder, "", AT_EMPTY_PATH, STATX_INO | STATX_BTIME, &status) != 0) return "";
    return std::to_string(status.stx_ino) + "." + std::to_string(status.stx_btime.tv_sec) + "." +
           std::to_string(status.stx_btime.tv_nsec);
}

int makeFolder(const Descriptor& folder, const std::string& name, const std::string& user, Descriptor& made) {
    const int code = checkNewName(folder, name);
    if (code != ORV_ERR_NONE) return code;
    if (geteuid() == 0) return makeFolderFor(user, folder, name, made);
    if (mkdirat(folder.get(), name.c_str(), kFolderMode) != 0) return OrvParseErrnoToError(errno, nullptr, nullptr);
    made = Descriptor(openat(folder.get(), name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    return made && giveNew(folder, made, user) ? static_cast<int>(ORV_ERR_NONE) : takeBack(folder, name);
}

int openTarget(const PathInfo& info, LinkPolicy policy, const std::string& user, Missing missing, Target& target) {
    Way way;
    int code = enter(info, policy, way, target);
    if (code == ORV_ERR_NONE && isInSnapshot(target.folder, target.name)) code = ORV_ERR_READ_ONLY;
    if (code != ORV_ERR_NONE) return code;
    if (way.existing < way.folders.size() && missing == Missing::kRefuse) return ORV_ERR_MISSING;
    for (size_t i = way.existing; i < way.folders.size(); ++i) {
        const std::string& name = way.folders[i];
        Descriptor made;
        code = makeFolder(target.folder, name, user, made);
        if (code == ORV_ERR_NONE) {
            target.made.push_back({std::move(target.folder), name});
        } else if (code == ORV_ERR_EXISTS) {
            // Another request made it meanwhile: entered like any other that exists.
            made = openBeneath(target.folder, name, policy, O_PATH | O_DIRECTORY);
        }
        if (!made) {
            removeMadeFolders(target);
            return code;
        }
        target.folder = std::move(made);
    }
    return ORV_ERR_NONE;
}

int openPresent(const PathInfo& info, Target& target) {
    Way way;
    int code = enter(info, linkPolicyOf(info.shareName), way, target);
    if (code == ORV_ERR_NONE && way.existing < way.folders.size()) code = ORV_ERR_MISSING;
    if (code == ORV_ERR_NONE) {
        VEXOShareNamesOf(target.folder.get());
        return VEXOEAIsHiddenFile(target.name.c_str()) == 0 ? ORV_ERR_NONE : ORV_ERR_MISSING;
    }
    return code == ORV_ERR_RESERVED_NAME && target.folder ? static_cast<int>(ORV_ERR_MISSING) : code;
}

int previewTarget(const PathInfo& info, LinkPolicy policy, Target& target, std::string& within) {
    Way way;
    int code = enter(info, policy, way, target);
    if (code != ORV_ERR_NONE) return code;
    const std::string top = realPathOf(way.root), deepest = realPathOf(target.folder);
    if (!deepest.starts_with(top) || top.empty()) return refusalCode(ENAMETOOLONG, info.realPath);
    within = deepest.substr(top.size());
    way.folders.push_back(target.name);
    for (size_t i = way.existing; i < way.folders.size(); ++i) {
        const std::string& name = way.folders[i];
        code = checkNewName(target.folder, name);
        if (code != ORV_ERR_NONE) return code;
        if (name.size() > NAME_MAX) return OrvParseErrnoToError(ENAMETOOLONG, info.shareName.c_str(), nullptr);
        within += "/" + name;
    }
    if (way.existing + 1 < way.folders.size()) target.folder = Descriptor();
    return ORV_ERR_NONE;
}

void removeMadeFolders(Target& target) {
    for (; !target.made.empty(); target.made.pop_back()) {
        unlinkat(target.made.back().parent.get(), target.made.back().name.c_str(), AT_REMOVEDIR);
    }
}

}  // namespace orvel::cgi
