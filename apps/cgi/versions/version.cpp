#include "versions/version.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "confined.h"
#include "free_names.h"
#include "orvel/error_state.h"
#include "text.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr int kPlace = O_PATH | O_CLOEXEC;

// Whether the calling identity may read the open file, or list the open folder and enter it. 0 or a library code.
int checkReadable(const Descriptor& found, const struct stat& status, const std::string& realPath) {
    const bool isFolder = S_ISDIR(status.st_mode);
    if (!isFolder && !S_ISREG(status.st_mode)) return ORV_ERR_DENIED;
    const Descriptor opened(open(found.path().c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (!opened) return refusalCode(errno, realPath);
    if (!isFolder) return ORV_ERR_NONE;
    const Descriptor entered(openat(opened.get(), ".", kPlace | O_DIRECTORY));
    return entered ? static_cast<int>(ORV_ERR_NONE) : refusalCode(errno, realPath);
}

std::string below(const std::string& folder, const std::string& name) {
    return folder == "/" ? "/" + name : folder + "/" + name;
}

std::string parentOf(const std::string& path) {
    const size_t slash = path.rfind('/');
    return slash == std::string::npos ? "." : path.substr(0, slash);
}

}  // namespace

int Present::open(const User& user, const std::string& path, Need need) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, info_)) return lastCode();
    int code = cgi::judge(user, info_.path, need);
    if (code != ORV_ERR_NONE) return code;
    root_ = Descriptor(::open(info_.shareRoot.c_str(), kPlace | O_DIRECTORY));
    if (!root_) return refusalCode(errno, info_.shareRoot);
    realRoot_ = realPathOf(root_);
    Descriptor found;
    code = confinedOpen(info_, linkPolicyOf(info_.shareName), O_PATH, found);
    if (code == ORV_ERR_MISSING) return findFolderOfMissing();
    if (code != ORV_ERR_NONE) return code;
    there_ = true;
    realPath_ = realPathOf(found);
    if (fstat(found.get(), &status_) != 0 || realPath_.empty()) return refusalCode(errno, info_.realPath);
    code = checkReadable(found, status_, info_.realPath);
    if (code != ORV_ERR_NONE) return code;
    folder_ = S_ISDIR(status_.st_mode) ? std::move(found) : Descriptor();
    realFolder_ = folder_ ? realPath_ : parentOf(realPath_);
    if (folder_) return ORV_ERR_NONE;
    // Beneath the root, by where the file lies: it may have been named by a link.
    folder_ = openBeneath(root_, pathBelow(realRoot_, realFolder_), LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    return folder_ ? static_cast<int>(ORV_ERR_NONE) : refusalCode(errno, info_.realPath);
}

// What is gone is judged by the deepest folder above that is left. No name below it may be one that never shows.
int Present::findFolderOfMissing() {
    const LinkPolicy policy = linkPolicyOf(info_.shareName);
    std::string left = pathBelow(info_.shareRoot, info_.realPath), gone;
    for (;;) {
        const size_t slash = left.rfind('/');
        const std::string name = slash == std::string::npos ? left : left.substr(slash + 1);
        if (name == "." || name == "..") return ORV_ERR_MISSING;
        if (!name.empty()) gone.insert(0, gone.empty() ? name : std::string(name).append("/"));
        left = parentOf(left);
        const int code = openShown(root_, root_, left, policy, O_PATH | O_DIRECTORY, info_.realPath, folder_);
        if (code == ORV_ERR_NONE) break;
        if (code != ORV_ERR_MISSING || left == ".") return code;
    }
    struct stat status {};
    realFolder_ = realPathOf(folder_);
    if (realFolder_.empty() || fstat(folder_.get(), &status) != 0) return refusalCode(errno, info_.realPath);
    const int code = checkReadable(folder_, status, info_.realPath);
    if (code != ORV_ERR_NONE) return code;
    realPath_ = realFolder_;
    for (std::string_view rest = gone; !rest.empty();) {
        const std::string name(rest.substr(0, rest.find('/')));
        VEXOShareNamesAt(realPath_.c_str());
        if (VEXOEAIsHiddenFile(name.c_str()) != 0) return ORV_ERR_MISSING;
        realPath_ = below(realPath_, name);
        rest.remove_prefix(std::min(name.size() + 1, rest.size()));
    }
    return ORV_ERR_NONE;
}

int Present::findShelves(Shelves& shelves) const {
    return cgi::findShelves(realRoot_, folder_, realFolder_, shelves);
}

int Present::judge(const std::string& path) const {
    if (!there_) return ORV_ERR_NONE;
    const LinkPolicy policy = linkPolicyOf(info_.shareName);
    const std::string whole = pathBelow(info_.shareRoot, info_.realPath) + "/" + path;
    const Descriptor found = openBeneath(root_, whole, policy, O_PATH);
    if (!found && (errno == ENOENT || errno == ENOTDIR)) return ORV_ERR_NONE;
    struct stat status {};
    if (!found || fstat(found.get(), &status) != 0) return refusalCode(errno, info_.realPath);
    return checkReadable(found, status, info_.realPath);
}

int openVersionIn(const Shelf& shelf, Version& version) {
    const std::string& path = version.present.realPath();
    if (path != shelf.base && shelf.base != "/" && !path.starts_with(shelf.base + "/")) return ORV_ERR_MISSING;
    version.root = openSnapshot(shelf, version.snapshot.name);
    if (!version.root) return ORV_ERR_MISSING;
    const std::string rest = pathBelow(shelf.base, path);
    version.inside = shelf.inside.empty() ? rest : rest == "." ? shelf.inside : shelf.inside + "/" + rest;
    version.opened = openBeneath(version.root, version.inside, LinkPolicy::kNone, O_PATH | O_NOFOLLOW);
    if (!version.opened || fstat(version.opened.get(), &version.status) != 0) {
        return errno == EACCES ? static_cast<int>(ORV_ERR_DENIED) : static_cast<int>(ORV_ERR_MISSING);
    }
    const mode_t kind = version.status.st_mode & S_IFMT;
    const bool fits = version.present.isThere() ? kind == (version.present.status().st_mode & S_IFMT)
                                                : kind == S_IFREG || kind == S_IFDIR;
    if (!fits) return ORV_ERR_MISSING;
    const std::string top = realPathOf(version.root);
    VEXOShareStandsFor((shelf.inside.empty() ? top : top + "/" + shelf.inside).c_str(), shelf.base.c_str());
    return ORV_ERR_NONE;
}

int openVersion(const User& user, const std::string& path, const std::string& name, Need need, Version& version) {
    Shelves shelves;
    int code = version.present.open(user, path, need);
    if (code == ORV_ERR_NONE) code = version.present.findShelves(shelves);
    if (code != ORV_ERR_NONE) return code;
    for (const Shelf& shelf : shelves.all) {
        const auto snapshot = snapshotOf(shelf, name);
        if (!snapshot) continue;
        version.snapshot = *snapshot;
        code = openVersionIn(shelf, version);
        if (code != ORV_ERR_MISSING) return code;
    }
    return ORV_ERR_MISSING;
}

std::optional<std::string> versionParam(const VEXO::WebCGI& web) {
    auto name = bytesParam(web, "snapshot");
    if (name && (name->empty() || name->find('/') != std::string::npos)) name.reset();
    return name;
}

bool namesVersion(const VEXO::WebCGI& web) {
    return web.HasParam("snapshot") || web.HasParam("snapshot_raw");
}

std::string versionName(const std::string& name, const Snapshot& snapshot, bool isFolder) {
    std::array<char, 64> text{};
    std::tm local{};
    const bool dated = snapshot.dated != Dated::kNot && localtime_r(&snapshot.time, &local) != nullptr;
    if (dated) static_cast<void>(strftime(text.data(), text.size(), "%Y-%m-%d %H.%M", &local));
    return markedName(name, dated ? std::string(text.data()) : readable(snapshot.name), isFolder);
}

}  // namespace orvel::cgi
