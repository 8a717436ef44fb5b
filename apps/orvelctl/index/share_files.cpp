#include "index/share_files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <cstring>
#include <utility>

#include "base/beneath.h"
#include "folder_names.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"

namespace orvel::ctl {
namespace {

constexpr unsigned kStatus = VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME;

// What was seen a moment ago has another kind, another name or none by now.
bool isGone(int error) {
    return error == ENOENT || error == ENOTDIR || error == ELOOP || error == ESTALE;
}

}  // namespace

bool Entry::isFolder() const {
    return S_ISDIR(status.st_mode);
}

ShareFiles::ShareFiles(std::string root, int* stop)
    : root_(std::move(root)), opened_(open(root_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)), stop_(stop) {}

// The indexer is root and users move their folders while it works: a link that took the place of one must not bring
// names from elsewhere into the index.
std::vector<Entry> ShareFiles::list(const std::string& folder) const {
    const auto unreadable = [](const std::string& path, int error) {
        return Unreadable("/" + path + " cannot be read: " + std::strerror(error));
    };
    const Descriptor opened =
        openBeneath(opened_, folder.empty() ? "." : folder, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    std::vector<std::string> names;
    if (!opened || !cgi::namesIn(opened.get(), cgi::Hidden::kLeaveOut, names)) {
        if (!folder.empty() && isGone(errno)) return {};
        throw unreadable(folder, errno);
    }
    std::vector<Entry> entries;
    const std::string prefix = folder.empty() ? "" : folder + "/";
    for (std::string& name : names) {
        if (*stop_ != 0) break;
        Entry entry{std::move(name), {}, {}};
        entry.path = prefix + entry.name;
        const std::string real = realPath(entry.path);
        if (real.size() >= PATH_MAX || (folder.empty() && VEXOShareIsShareRecycle(real.c_str()) == 1)) continue;
        if (VLIBCFileLStatAt(opened.get(), entry.name.c_str(), kStatus, &entry.status) < 0) {
            const int error = errno;
            if (isGone(error) || isRemoteMount(entry.path)) continue;
            throw unreadable(entry.path, error);
        }
        if (S_ISREG(entry.status.st_mode) || (entry.isFolder() && !isRemoteMount(entry.path))) {
            entries.push_back(std::move(entry));
        }
    }
    return entries;
}

Presence ShareFiles::status(const std::string& path, _tag_VEXOSTAT_& status) const {
    const size_t slash = path.rfind('/');
    const std::string parent = slash == std::string::npos ? "." : path.substr(0, slash);
    const std::string name = path.empty() ? "." : path.substr(slash + 1);
    const Descriptor folder = openBeneath(opened_, parent, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    if (!folder || VLIBCFileLStatAt(folder.get(), name.c_str(), kStatus, &status) < 0) {
        return isGone(errno) ? Presence::kGone : Presence::kUnknown;
    }
    return S_ISREG(status.st_mode) || S_ISDIR(status.st_mode) ? Presence::kThere : Presence::kGone;
}

bool ShareFiles::isRemoteMount(const std::string& path) const {
    return VEXOFSIsInMountTable(realPath(path).c_str()) >= 0 && VEXOFSIsRemoteFS() == 1;
}

}  // namespace orvel::ctl
