#include "confined.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <memory>
#include <string_view>

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/share.h"

namespace orvel::cgi {
namespace {

struct ReleaseShare {
    void operator()(SDK::Share* share) const { SDK::Share::Release(share); }
};

Descriptor openRoot(const PathInfo& info) {
    return Descriptor(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
}

// What follows the share root, "." for the root itself.
std::string restOf(const PathInfo& info) {
    std::string rest = info.realPath.substr(info.shareRoot.size());
    rest.erase(0, std::min(rest.find_first_not_of('/'), rest.size()));
    return rest.empty() ? "." : rest;
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

Descriptor openBeneath(const Descriptor& root, const std::string& path, LinkPolicy policy, int flags) {
    open_how how = {};
    how.flags = static_cast<unsigned>(flags) | O_CLOEXEC;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_MAGICLINKS;
    if (policy == LinkPolicy::kNone) how.resolve |= RESOLVE_NO_SYMLINKS;
    // The kernel gives up with EAGAIN when a folder is moved while it passes "..".
    for (int attempt = 0;; ++attempt) {
        const long fd = syscall(SYS_openat2, root.get(), path.c_str(), &how, sizeof how);
        if (fd >= 0 || errno != EAGAIN || attempt == 100) return Descriptor(static_cast<int>(fd));
    }
}

std::string realPathOf(const Descriptor& folder) {
    char path[PATH_MAX];
    const ssize_t length = readlink(folder.path().c_str(), path, sizeof path);
    const bool whole = length > 0 && length < static_cast<ssize_t>(sizeof path);
    return whole ? std::string(path, static_cast<size_t>(length)) : "";
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

int confinedFolder(const PathInfo& info, LinkPolicy policy, std::string& realPath) {
    const Descriptor root = openRoot(info);
    if (!root) return folderRefusalCode(errno, info.shareRoot);
    const Descriptor folder = openBeneath(root, restOf(info), policy, O_PATH | O_DIRECTORY);
    if (!folder) return folderRefusalCode(errno, info.realPath);

    const std::string canonicalRoot = realPathOf(root);
    const std::string canonical = realPathOf(folder);
    if (canonicalRoot.empty() || !canonical.starts_with(canonicalRoot)) return ORV_ERR_DIRECTORY;
    realPath = info.shareRoot + canonical.substr(canonicalRoot.size());
    return ORV_ERR_NONE;
}

int confinedOpen(const PathInfo& info, LinkPolicy policy, int flags, Descriptor& opened) {
    const Descriptor root = openRoot(info);
    if (!root) return refusalCode(errno, info.shareRoot);
    opened = openBeneath(root, restOf(info), policy, flags);
    return opened ? ORV_ERR_NONE : refusalCode(errno, info.realPath);
}

}  // namespace orvel::cgi
