// What changes below a folder, as the kernel reports it.
#ifndef ORVEL_ORVELCTL_INDEX_FILE_EVENTS_H
#define ORVEL_ORVELCTL_INDEX_FILE_EVENTS_H

#include <map>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"

namespace orvel::ctl {

// Names that were touched, by folder (path below the root, "" for the root itself), and of each whether something moved
// there or away or was removed. The name "" is the folder itself.
using Touched = std::map<std::string, std::map<std::string, bool>>;

// Events are not to be had here; the text says why.
class NoFileEvents : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

// Every file system at or below the root is watched as a whole: marks on single folders would cost memory for each, and
// would miss what happens before they are set. Needs Linux 5.9 and root.
class FileEvents {
 public:
    // Throws NoFileEvents.
    explicit FileEvents(const std::string& root);

    // Readable when there is something to read.
    [[nodiscard]] int descriptor() const { return queue_.get(); }
    // Adds what has happened, some thousand events at most, and their number to `count`. False when events were lost.
    // Throws NoFileEvents.
    [[nodiscard]] bool read(Touched& touched, size_t& count);
    // Whether the file systems at or below the root are other ones than at the beginning.
    [[nodiscard]] bool mountsChanged() const;

 private:
    struct Mount {
        Descriptor folder;  // where handles are resolved
        int fileSystem[2];  // as events name it
    };
    void watch(const std::string& mountPoint);
    [[nodiscard]] bool take(std::string_view events, Touched& touched, size_t& count);
    void note(const char* folderInfo, unsigned long long changes, Touched& touched);
    // The path below the root of the folder that a handle means. False when it is gone or lies elsewhere.
    [[nodiscard]] bool resolve(const char* folderInfo, std::string& path);

    std::string root_;
    Descriptor queue_;
    std::vector<Mount> mounts_;
    std::vector<std::string> points_;              // the mounts below the root
    std::map<std::string, std::string> resolved_;  // in one reading; "/" for what lies elsewhere
};

}  // namespace orvel::ctl

#endif
