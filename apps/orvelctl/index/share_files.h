// The files of a share as an index takes them.
#ifndef ORVEL_ORVELCTL_INDEX_SHARE_FILES_H
#define ORVEL_ORVELCTL_INDEX_SHARE_FILES_H

#include <stdexcept>
#include <string>
#include <vector>

#include "base/descriptor.h"
#include "index/folder_state.h"
#include "vexo/stat.h"

namespace orvel::ctl {

struct Entry {
    std::string name;
    std::string path;  // within the share
    _tag_VEXOSTAT_ status;

    [[nodiscard]] bool isFolder() const;
};

inline FolderTimes timesOf(const _tag_VEXOSTAT_& status) {
    return {status.st_modify, status.st_change, status.st_create};
}

// Whether a file or folder is there.
enum class Presence { kGone, kThere, kUnknown /* an error keeps from telling */ };

// A folder, or a file's status, that is there and cannot be read; the text says which and why.
class Unreadable : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

class ShareFiles {
 public:
    // `root`: real path of the share's root. A nonzero `*stop` ends a listing early.
    ShareFiles(std::string root, int* stop);

    [[nodiscard]] const std::string& root() const { return root_; }
    [[nodiscard]] const Descriptor& openedRoot() const { return opened_; }
    [[nodiscard]] std::string realPath(const std::string& path) const {
        return path.empty() ? root_ : root_ + "/" + path;
    }

    // What a walk reports of one folder ("" is the root), without network mounts and without paths too long to be
    // asked for. Empty when it is gone meanwhile, or is reached through a link. Throws Unreadable.
    [[nodiscard]] std::vector<Entry> list(const std::string& folder) const;
    // The status of a file or folder; one that is reached through a link is gone.
    [[nodiscard]] Presence status(const std::string& path, _tag_VEXOSTAT_& status) const;
    // Known from the mount table alone: the server may be dead.
    [[nodiscard]] bool isRemoteMount(const std::string& path) const;

 private:
    std::string root_;
    Descriptor opened_;  // the root
    int* stop_;
};

}  // namespace orvel::ctl

#endif
