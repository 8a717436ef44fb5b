#include "operation/moved_links.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/owner.h"
#include "operation/member_path.h"

namespace orvel::cgi {
namespace {

using Names = std::unique_ptr<DIR, Releaser<closedir>>;

std::optional<std::size_t> depthOf(const PathInfo& info, const Descriptor& folder) {
    const auto path = pathInShare(info, folder);
    if (!path) return std::nullopt;
    return static_cast<std::size_t>(std::count(path->begin(), path->end(), '/'));
}

// Looks for a link that leads out from `after` folders below a share's root, but not from `before`.
class Search {
 public:
    Search(std::size_t before, std::size_t after) : before_(before), after_(after) {}

    // Whether there is none at or below `name` of `parent`, which lies `level` folders deeper than the item. A failure
    // counts as one, except what the user may not read: nobody but its owner put links there.
    // NOLINTNEXTLINE(misc-no-recursion): as deep as the tree, which the move itself bounds
    [[nodiscard]] bool passes(int parent, const char* name, unsigned char type, std::size_t level) {
        if (type == DT_LNK) return linkPasses(parent, name, level);
        if (type != DT_DIR && type != DT_UNKNOWN) return true;
        const int folder = openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
        if (folder >= 0) return folderPasses(folder, level + 1);
        if (errno == ENOTDIR || errno == ELOOP) return linkPasses(parent, name, level);
        return errno == EACCES || errno == ENOENT;
    }

 private:
    // Takes the descriptor over.
    [[nodiscard]] bool folderPasses(int folder, std::size_t level) {
        const Names names(fdopendir(folder));
        if (names == nullptr) {
            close(folder);
            return false;
        }
        for (;;) {
            errno = 0;
            const dirent* entry = readdir(names.get());
            if (entry == nullptr) return errno == 0;
            const std::string name = entry->d_name;
            if (name != "." && name != ".." && !passes(folder, name.c_str(), entry->d_type, level)) return false;
        }
    }

    // Also for what is no link.
    [[nodiscard]] bool linkPasses(int parent, const char* name, std::size_t level) {
        const ssize_t length = readlinkat(parent, name, text_.data(), text_.size());
        if (length < 0) return errno == EINVAL || errno == ENOENT;
        const std::string_view link(text_.data(), static_cast<std::size_t>(length));
        return staysInside(link, after_ + level) || !staysInside(link, before_ + level);
    }

    std::size_t before_, after_;
    std::array<char, PATH_MAX> text_{};  // of a link; too much for each level of the stack
};

}  // namespace

bool linksStayInside(const Item& item, const PathInfo& info, const Descriptor& folder) {
    const auto before = depthOf(item.info, item.place.folder), after = depthOf(info, folder);
    if (!before || !after) return false;
    if (*after >= *before) return true;
    return Search(*before, *after).passes(item.place.folder.get(), item.place.name.c_str(), DT_UNKNOWN, 0);
}

}  // namespace orvel::cgi
