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

class Descriptor {
 public:
    explicit Descriptor(int fd) : fd_(fd) {}
    ~Descriptor() {
        if (fd_ >= 0) close(fd_);
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;
    [[nodiscard]] int get() const { return fd_; }

 private:
    int fd_;
};

struct ReleaseShare {
    void operator()(SDK::Share* share) const { SDK::Share::Release(share); }
};

int openBeneath(int root, const char* path, LinkPolicy policy) {
    open_how how = {};
    how.flags = O_PATH | O_DIRECTORY | O_CLOEXEC;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_MAGICLINKS;
    if (policy == LinkPolicy::kNone) how.resolve |= RESOLVE_NO_SYMLINKS;
    // The kernel gives up with EAGAIN when a folder is moved while it passes "..".
    for (int attempt = 0;; ++attempt) {
        const long fd = syscall(SYS_openat2, root, path, &how, sizeof how);
        if (fd >= 0 || errno != EAGAIN || attempt == 100) return static_cast<int>(fd);
    }
}

// The path of an open folder, "" on failure.
std::string pathOf(int fd) {
    char path[PATH_MAX];
    const std::string link = "/proc/self/fd/" + std::to_string(fd);
    const ssize_t length = readlink(link.c_str(), path, sizeof path);
    return length > 0 && length < static_cast<ssize_t>(sizeof path) ? std::string(path, static_cast<size_t>(length))
                                                                    : "";
}

bool isServerDown(int error) {
    return error == EHOSTDOWN || error == ENXIO || error == EIO || error == ENOENT;
}

// Why the folder could not be opened, in the library's own terms.
int refusalCode(int error, const std::string& realPath) {
    if (error == EXDEV || error == ELOOP) return ORV_ERR_DENIED;
    if (isServerDown(error) && VEXOFSIsInMountTable(realPath.c_str()) != -1 && VEXOFSIsRemoteFS() == 1) {
        return ORV_ERR_REMOTE;
    }
    if (!CheckDirListPrivilege(realPath.c_str())) return OrvLibGetErr();
    return ORV_ERR_DIRECTORY;
}

}  // namespace

LinkPolicy linkPolicyOf(const std::string& shareName) {
    std::string name = shareName;
    if (!IsDirUserHome(shareName, nullptr)) {
        // Shares answer to any spelling of their name; settings do not.
        const std::unique_ptr<SDK::Share, ReleaseShare> share(SDK::Share::LoadShare(shareName.c_str()));
        if (share == nullptr) return LinkPolicy::kNone;
        name = share->GetName();
    }
    return VexoConf::Info().Get("link_policy_" + name, "inside") == "inside" ? LinkPolicy::kInside : LinkPolicy::kNone;
}

int confinedFolder(const PathInfo& info, LinkPolicy policy, std::string& realPath) {
    const Descriptor root(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (root.get() < 0) return refusalCode(errno, info.shareRoot);
    std::string_view rest = std::string_view(info.realPath).substr(info.shareRoot.size());
    rest.remove_prefix(std::min(rest.find_first_not_of('/'), rest.size()));
    const Descriptor folder(openBeneath(root.get(), rest.empty() ? "." : std::string(rest).c_str(), policy));
    if (folder.get() < 0) return refusalCode(errno, info.realPath);

    const std::string canonicalRoot = pathOf(root.get());
    const std::string canonical = pathOf(folder.get());
    if (canonicalRoot.empty() || !canonical.starts_with(canonicalRoot)) return ORV_ERR_DIRECTORY;
    realPath = info.shareRoot + canonical.substr(canonicalRoot.size());
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
