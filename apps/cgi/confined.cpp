#include "confined.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <string_view>

#include "base/file.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/share.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr int kMostTries = 100;  // to open what others replace again and again

struct ReleaseShare {
    void operator()(SDK::Share* share) const { SDK::Share::Release(share); }
};

Descriptor openRoot(const PathInfo& info) {
    return Descriptor(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
}

std::optional<std::string> pathBetween(const Descriptor& root, const Descriptor& opened) {
    const std::string top = realPathOf(root), path = realPathOf(opened);
    const bool below = !top.empty() && (path == top || path.starts_with(top + "/"));
    return below ? std::optional(path.substr(top.size())) : std::nullopt;
}

bool isServerDown(int error) {
    return error == EHOSTDOWN || error == ENXIO || error == EIO || error == ENOENT;
}

}  // namespace

std::string definedShareName(const std::string& shareName) {
    if (IsDirUserHome(shareName, nullptr)) return shareName;
    const std::unique_ptr<SDK::Share, ReleaseShare> share(SDK::Share::LoadShare(shareName.c_str()));
    return share != nullptr ? share->GetName() : "";
}

LinkPolicy linkPolicyOf(const std::string& shareName) {
    const std::string name = definedShareName(shareName);
    if (name.empty()) return LinkPolicy::kNone;
    return VexoConf::Info().Get("link_policy_" + name, "inside") == "inside" ? LinkPolicy::kInside : LinkPolicy::kNone;
}

bool isHiddenPlace(const Descriptor& root, const Descriptor& opened) {
    const auto within = pathBetween(root, opened);
    if (!within) return false;  // moved away since
    std::string folder = realPathOf(root);
    for (std::string_view rest = *within; !rest.empty();) {
        rest.remove_prefix(1);
        const std::string name(rest.substr(0, rest.find('/')));
        VEXOShareNamesAt(folder.c_str());
        if (VEXOEAIsHiddenFile(name.c_str()) != 0) return true;
        folder += "/" + name;
        rest.remove_prefix(name.size());
    }
    VEXOShareNamesOf(opened.get());  // it is asked about what it holds next
    return false;
}

int refusalCode(int error, const std::string& realPath) {
    if (error == EXDEV || error == ELOOP) return ORV_ERR_DENIED;
    if (isServerDown(error) && VEXOFSIsInMountTable(realPath.c_str()) != -1 && VEXOFSIsRemoteFS() == 1) {
        return ORV_ERR_REMOTE;
    }
    const int code = OrvParseErrnoToError(error, nullptr, nullptr);
    return code != ORV_ERR_GENERAL ? code : ORV_ERR_DIRECTORY;
}

// The listing of a folder knows fewer reasons than other operations.
static int folderRefusalCode(int error, const std::string& realPath) {
    const int code = refusalCode(error, realPath);
    const bool known = code == ORV_ERR_DENIED || code == ORV_ERR_MISSING || code == ORV_ERR_REMOTE;
    return known ? code : ORV_ERR_DIRECTORY;
}

int confinedFolder(const PathInfo& info, LinkPolicy policy, Descriptor& folder, std::string& realPath) {
    const Descriptor root = openRoot(info);
    if (!root) return folderRefusalCode(errno, info.shareRoot);
    folder = openBeneath(root, pathBelow(info.shareRoot, info.realPath), policy, O_PATH | O_DIRECTORY);
    if (!folder) return folderRefusalCode(errno, info.realPath);
    if (isHiddenPlace(root, folder)) return ORV_ERR_MISSING;
    const auto within = pathBetween(root, folder);
    if (!within) return ORV_ERR_DIRECTORY;
    realPath = info.shareRoot + *within;
    return ORV_ERR_NONE;
}

int openShown(const Descriptor& root, const Descriptor& from, const std::string& path, LinkPolicy policy, int flags,
              const std::string& realPath, Descriptor& opened) {
    struct stat before {
    }, now{};
    for (int tries = 0; tries < kMostTries; ++tries) {
        opened = openBeneath(from, path, policy, flags);
        if (!opened) return refusalCode(errno, realPath);
        if (!isHiddenPlace(root, opened)) return ORV_ERR_NONE;
        // A file that is replaced bears a hidden name once the new one has its own: then this is the new one.
        if (fstat(opened.get(), &now) != 0 || (tries > 0 && isSameFile(before, now))) break;
        before = now;
    }
    return ORV_ERR_MISSING;
}

int confinedOpen(const PathInfo& info, LinkPolicy policy, int flags, Descriptor& opened) {
    const Descriptor root = openRoot(info);
    if (!root) return refusalCode(errno, info.shareRoot);
    return openShown(root, root, pathBelow(info.shareRoot, info.realPath), policy, flags, info.realPath, opened);
}

std::optional<std::string> pathInShare(const PathInfo& info, const Descriptor& opened) {
    const Descriptor root = openRoot(info);
    return root ? pathBetween(root, opened) : std::nullopt;
}

}  // namespace orvel::cgi
