#include "index/share_files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>

#include "base/beneath.h"
#include "orvel/directory_walker.h"
#include "vexo/filesystem.h"

namespace orvel::ctl {
namespace {

class Collector final : public OrvDirectoryWalkerCallBack {
 public:
    // `prefix`: the folder's path within the share, with a "/" behind it.
    Collector(size_t folderLength, std::string prefix) : folderLength_(folderLength), prefix_(std::move(prefix)) {}

    bool operator()(const std::string&, const std::string&, const std::string&, const std::string& name,
                    _tag_VEXOSTAT_& status, const std::string*) override {
        const bool kept = S_ISREG(status.st_mode) || S_ISDIR(status.st_mode);
        const bool fits = folderLength_ + 1 + name.size() < PATH_MAX;
        if (kept && fits) entries.push_back({name, prefix_ + name, status});
        return true;
    }

    std::vector<Entry> entries;

 private:
    size_t folderLength_;  // of its real path
    std::string prefix_;
};

}  // namespace

bool Entry::isFolder() const {
    return S_ISDIR(status.st_mode);
}

ShareFiles::ShareFiles(std::string root, int* stop)
    : root_(std::move(root)), opened_(open(root_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)), stop_(stop) {}

// The indexer is root and users move their folders while it works: a link that took the place of one must not bring
// names from elsewhere into the index.
std::vector<Entry> ShareFiles::list(const std::string& folder) const {
    Descriptor below;
    if (!folder.empty()) {
        below = openBeneath(opened_, folder, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
        if (!below) return {};
    }
    Collector collector(realPath(folder).size(), folder.empty() ? "" : folder + "/");
    // As a search does it: what cannot be read is passed over.
    OrvDirectoryWalker walker(ENUM_IGNORE_ALL_ERR, stop_);
    walker.Walk_FirstFolder_First(folder, root_, below ? below.path() : root_, collector, nullptr, folder.empty(),
                                  true);
    std::erase_if(collector.entries,
                  [this](const Entry& entry) { return entry.isFolder() && isRemoteMount(entry.path); });
    return std::move(collector.entries);
}

Presence ShareFiles::status(const std::string& path, _tag_VEXOSTAT_& status) const {
    const size_t slash = path.rfind('/');
    const std::string parent = slash == std::string::npos ? "." : path.substr(0, slash);
    const std::string name = path.empty() ? "." : path.substr(slash + 1);
    const Descriptor folder = openBeneath(opened_, parent, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    if (!folder || VLIBCFileLStatAt(folder.get(), name.c_str(), VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME, &status) < 0) {
        const bool gone = errno == ENOENT || errno == ENOTDIR || errno == ELOOP;
        return gone ? Presence::kGone : Presence::kUnknown;
    }
    return S_ISREG(status.st_mode) || S_ISDIR(status.st_mode) ? Presence::kThere : Presence::kGone;
}

bool ShareFiles::isRemoteMount(const std::string& path) const {
    return VEXOFSIsInMountTable(realPath(path).c_str()) >= 0 && VEXOFSIsRemoteFS() == 1;
}

}  // namespace orvel::ctl
