#include "base/beneath.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

namespace orvel {

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

std::string linkedPath(const std::string& link) {
    char path[PATH_MAX];
    const ssize_t length = readlink(link.c_str(), path, sizeof path);
    const bool whole = length > 0 && length < static_cast<ssize_t>(sizeof path) && path[0] == '/';
    if (whole) return {path, static_cast<size_t>(length)};
    if (length >= 0) errno = length < static_cast<ssize_t>(sizeof path) ? ENOENT : ENAMETOOLONG;
    return "";
}

std::string pathBelow(const std::string& root, const std::string& path) {
    std::string rest = path.substr(std::min(root.size(), path.size()));
    rest.erase(0, std::min(rest.find_first_not_of('/'), rest.size()));
    return rest.empty() ? "." : rest;
}

}  // namespace orvel
