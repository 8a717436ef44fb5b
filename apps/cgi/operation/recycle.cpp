#include "operation/recycle.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <climits>
#include <string_view>
#include <utility>

#include "base/keep_errno.h"
#include "orvel/error_state.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr int kOpenFolder = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
constexpr int kMostNumbers = 9999;

// Where the mark at the end of `stem` begins; npos when there is none.
size_t markIn(std::string_view stem) {
    const size_t begin = stem.rfind(" (#");
    if (begin == std::string_view::npos || !stem.ends_with(')') || stem.size() < begin + 5) return stem.npos;
    const std::string_view digits = stem.substr(begin + 3, stem.size() - begin - 4);
    const bool number = std::all_of(digits.begin(), digits.end(), [](unsigned char c) { return isdigit(c) != 0; });
    return number ? begin : stem.npos;
}

// Where the ending of a name begins; its length when it has none, or when a mark stands at its very end.
size_t endingOf(const std::string& name) {
    constexpr size_t kLongestEnding = 32;
    const size_t dot = name.rfind('.');
    const bool hasEnding = dot != std::string::npos && dot != 0 && name.size() - dot <= kLongestEnding;
    return hasEnding && markIn(name) == std::string::npos ? dot : name.size();
}

bool isWritable(const Descriptor& folder) {
    return faccessat(AT_FDCWD, folder.path().c_str(), W_OK | X_OK, AT_EACCESS) == 0;
}

// Makes `name` in `folder` with the permissions of `original` and opens it. Invalid with errno.
Descriptor makeLike(const Descriptor& folder, const std::string& name, const Descriptor& original, const Owner& owner) {
    struct stat status {};
    if (fstat(original.get(), &status) != 0 || mkdirat(folder.get(), name.c_str(), 0700) != 0) return Descriptor();
    Descriptor made(openat(folder.get(), name.c_str(), kOpenFolder));
    if (!made) {
        const KeepErrno keep;
        unlinkat(folder.get(), name.c_str(), AT_REMOVEDIR);
        return made;
    }
    [[maybe_unused]] int ignored = fchownat(made.get(), "", owner.uid, owner.gid, AT_EMPTY_PATH);  // not kept by FAT
    ignored = fchmodat(AT_FDCWD, made.path().c_str(), status.st_mode & 0777, 0);
    return made;
}

// Enters the folder of the bin that stands for `name`, made when there is none: `made` says so then.
Descriptor enter(const Descriptor& folder, const std::string& name, const Descriptor& original, const Owner& owner,
                 std::vector<MadeFolder>& made) {
    for (int number = 1; number <= kMostNumbers; ++number) {
        const std::string inBin = binName(name, number);
        Descriptor found(openat(folder.get(), inBin.c_str(), kOpenFolder));
        if (!found && errno == ENOENT) {
            Descriptor parent(openat(folder.get(), ".", kOpenFolder));
            if (parent) found = makeLike(folder, inBin, original, owner);
            if (found) made.push_back({std::move(parent), inBin});
        }
        if (found && isWritable(found)) return found;
        const bool taken = found || errno == EEXIST || errno == ENOTDIR || errno == ELOOP;
        if (!taken) return Descriptor();
    }
    errno = EEXIST;
    return Descriptor();
}

// As Samba's module makes them: the owner's alone. Our own bin is there where the administrator made it.
Descriptor openBin(const Descriptor& root, std::string_view path, bool make) {
    make = make && path != "#recycle";
    Descriptor folder(openat(root.get(), ".", kOpenFolder));
    while (folder && !path.empty()) {
        const std::string name(path.substr(0, path.find('/')));
        path.remove_prefix(std::min(name.size() + 1, path.size()));
        Descriptor next(openat(folder.get(), name.c_str(), kOpenFolder));
        if (!next && errno == ENOENT && make && mkdirat(folder.get(), name.c_str(), 0700) == 0) {
            next = Descriptor(openat(folder.get(), name.c_str(), kOpenFolder));
        }
        folder = std::move(next);
    }
    return folder;
}

// The components between the real path `top` and the item's own name.
std::vector<std::string> foldersOf(const Item& item, const std::string& top) {
    std::vector<std::string> folders;
    const std::string path = item.realPath();
    std::string_view rest = path;
    rest.remove_prefix(std::min(top.size() + 1, rest.size()));
    for (size_t slash = rest.find('/'); slash != std::string_view::npos; slash = rest.find('/')) {
        folders.emplace_back(rest.substr(0, slash));
        rest.remove_prefix(slash + 1);
    }
    return folders;
}

}  // namespace

std::string binName(const std::string& name, int number) {
    if (number == 1 && originalName(name) == name) return name;
    const size_t ending = endingOf(name);
    return name.substr(0, ending) + " (#" + std::to_string(number) + ")" + name.substr(ending);
}

std::string originalName(const std::string& nameInBin) {
    const size_t ending = endingOf(nameInBin);
    const size_t mark = markIn(std::string_view(nameInBin).substr(0, ending));
    return mark == std::string::npos ? nameInBin : nameInBin.substr(0, mark) + nameInBin.substr(ending);
}

std::string nextBinName(const std::string& name, int number, bool /*isFolder*/) {
    return binName(originalName(name), number);
}

int RecycleBin::open(const PathInfo& info, std::optional<RecycleBin>& bin) {
    return open(info, true, bin);
}

int RecycleBin::openPresent(const PathInfo& info, std::optional<RecycleBin>& bin) {
    return open(info, false, bin);
}

int RecycleBin::open(const PathInfo& info, bool make, std::optional<RecycleBin>& bin) {
    RecycleBin found;
    found.root_ = Descriptor(::open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!found.root_) return refusalCode(errno, info.shareRoot);
    char path[PATH_MAX];
    if (VEXOShareRecyclePath(info.shareRoot.c_str(), path, sizeof path) != 0) {
        return OrvParseErrnoToError(errno, nullptr, nullptr);
    }
    found.name_ = path;
    found.folder_ = openBin(found.root_, found.name_, make);
    const bool none = !found.folder_ && (errno == ENOENT || errno == ENOTDIR || errno == ELOOP);
    if (!found.folder_) return none ? static_cast<int>(ORV_ERR_NONE) : refusalCode(errno, info.shareRoot);
    found.shareName_ = info.shareName;
    found.rootPath_ = realPathOf(found.root_);
    if (!found.rootPath_.empty()) found.path_ = realPathOf(found.folder_);
    if (found.path_.empty()) return refusalCode(errno, info.shareRoot);  // anything would seem to lie in it
    bin = std::move(found);
    return ORV_ERR_NONE;
}

int RecycleBin::placeFor(const Item& item, const Owner& owner, Target& target, Entry& place) const {
    Descriptor original(openat(root_.get(), ".", kOpenFolder));
    target.folder = Descriptor(openat(folder_.get(), ".", kOpenFolder));
    if (!original || !target.folder) return OrvParseErrnoToError(errno, nullptr, nullptr);
    std::string path = sharePath();
    for (const std::string& name : foldersOf(item, rootPath_)) {
        original = Descriptor(openat(original.get(), name.c_str(), kOpenFolder));
        if (original) target.folder = enter(target.folder, name, original, owner, target.made);
        if (!original || !target.folder) {
            const int code = OrvParseErrnoToError(errno, nullptr, nullptr);
            removeMadeFolders(target);
            return code;
        }
        path += "/" + name;
    }
    target.name = binName(item.place.name, 1);
    place = {target.folder.get(), target.name, path + "/" + target.name};
    return ORV_ERR_NONE;
}

std::string RecycleBin::originOf(const Item& item) const {
    return originOf(item.realPath().substr(path_.size() + 1));
}

std::string RecycleBin::originOf(const std::string& path) const {
    std::string origin = "/" + shareName_;
    for (size_t begin = 0, end = 0; end != path.size(); begin = end + 1) {
        end = std::min(path.find('/', begin), path.size());
        origin += "/" + originalName(path.substr(begin, end - begin));
    }
    return origin;
}

void RecycleBin::prune(const Item& item) const {
    std::vector<std::string> folders = foldersOf(item, path_);
    while (!folders.empty()) {
        const std::string name = std::move(folders.back());
        folders.pop_back();
        std::string path = ".";
        for (const std::string& above : folders) path += "/" + above;
        // No link that was put in the way since may lead to somebody else's folders.
        const Descriptor parent = openBeneath(folder_, path, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
        if (!parent || unlinkat(parent.get(), name.c_str(), AT_REMOVEDIR) != 0) return;
    }
}

}  // namespace orvel::cgi
