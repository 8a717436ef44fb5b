#include "target.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <string_view>
#include <vector>

#include "orvel/error_state.h"
#include "orvel/name_check.h"
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

// An administrator's process is root: what it makes is handed to the administrator's own account.
void handOver(const Descriptor& made, const std::string& user) {
    uid_t uid = 0;
    gid_t gid = 0;
    if (geteuid() != 0 || VEXOUserGetUGID(user.c_str(), &uid, &gid) != 0) return;
    static_cast<void>(fchownat(made.get(), "", uid, gid, AT_EMPTY_PATH));  // FAT keeps no owners
}

int lastCode() {
    const int code = OrvLibGetErr();
    return code != ORV_ERR_NONE ? code : ORV_ERR_GENERAL;
}

}  // namespace

int makeFolder(const Descriptor& folder, const std::string& name, const std::string& user, Descriptor& made) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (OrvCheckFileName(realPathOf(folder).c_str(), name.c_str()) != 0) return lastCode();
    if (mkdirat(folder.get(), name.c_str(), kFolderMode) != 0) return OrvParseErrnoToError(errno, nullptr, nullptr);
    made = Descriptor(openat(folder.get(), name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!made) return OrvParseErrnoToError(errno, nullptr, nullptr);
    handOver(made, user);
    return ORV_ERR_NONE;
}

int openTarget(const PathInfo& info, LinkPolicy policy, const std::string& user, bool makeFolders, Target& target) {
    std::vector<std::string> components = componentsOf(std::string_view(info.realPath).substr(info.shareRoot.size()));
    if (components.empty() || components.back() == "..") return ORV_ERR_PARAMETER;
    target.name = components.back();
    components.pop_back();

    const Descriptor root(open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!root) return refusalCode(errno, info.shareRoot);
    size_t existing = components.size();
    for (;; --existing) {
        target.folder = openBeneath(root, joined(components, existing), policy, O_PATH | O_DIRECTORY);
        if (target.folder) break;
        if (errno != ENOENT || !makeFolders || existing == 0) return refusalCode(errno, info.realPath);
    }
    for (; existing < components.size(); ++existing) {
        Descriptor made;
        const int code = makeFolder(target.folder, components[existing], user, made);
        // Another request made it meanwhile: entered like any other that exists.
        if (code == ORV_ERR_EXISTS)
            made = openBeneath(target.folder, components[existing], policy, O_PATH | O_DIRECTORY);
        if (!made) return code;
        target.folder = std::move(made);
    }
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
