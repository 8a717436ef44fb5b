#include "index/share_files.h"

#include <sys/stat.h>

#include <cerrno>
#include <climits>

#include "orvel/directory_walker.h"
#include "vexo/filesystem.h"

namespace orvel::ctl {
namespace {

class Collector final : public OrvDirectoryWalkerCallBack {
 public:
    explicit Collector(std::string prefix) : prefix_(std::move(prefix)) {}

    bool operator()(const std::string&, const std::string&, const std::string& realPath, const std::string& name,
                    _tag_VEXOSTAT_& status, const std::string*) override {
        const bool kept = S_ISREG(status.st_mode) || S_ISDIR(status.st_mode);
        if (kept && realPath.size() < PATH_MAX) entries.push_back({name, prefix_ + name, status});
        return true;
    }

    std::vector<Entry> entries;

 private:
    std::string prefix_;
};

}  // namespace

bool Entry::isFolder() const {
    return S_ISDIR(status.st_mode);
}

std::vector<Entry> ShareFiles::list(const std::string& folder) const {
    Collector collector(folder.empty() ? "" : folder + "/");
    // As a search does it: what cannot be read is passed over.
    OrvDirectoryWalker walker(ENUM_IGNORE_ALL_ERR, stop_);
    walker.Walk_FirstFolder_First(folder, root_, realPath(folder), collector, nullptr, folder.empty(), true);
    std::erase_if(collector.entries,
                  [this](const Entry& entry) { return entry.isFolder() && isRemoteMount(entry.path); });
    return std::move(collector.entries);
}

Presence ShareFiles::status(const std::string& path, _tag_VEXOSTAT_& status) const {
    if (VLIBCFileLStat(realPath(path).c_str(), VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME, &status) < 0) {
        return errno == ENOENT || errno == ENOTDIR ? Presence::kGone : Presence::kUnknown;
    }
    return S_ISREG(status.st_mode) || S_ISDIR(status.st_mode) ? Presence::kThere : Presence::kGone;
}

bool ShareFiles::isRemoteMount(const std::string& path) const {
    return VEXOFSIsInMountTable(realPath(path).c_str()) >= 0 && VEXOFSIsRemoteFS() == 1;
}

}  // namespace orvel::ctl
