// A folder that a caller names by its real path.
#ifndef ORVEL_CORE_GIVEN_FOLDER_H
#define ORVEL_CORE_GIVEN_FOLDER_H

#include <string>

#include "base/descriptor.h"

namespace orvel {

// Which step a failure ended.
enum class EntryFailure { kChangeDirectory, kOpen };

struct EnteredFolder {
    Descriptor folder;  // for reading; null on failure
    EntryFailure failure = EntryFailure::kOpen;
    int error = 0;  // errno of the failure
};

// The step that a failed look-up stands for: that of entering, unless descriptors are what lacks, since only opening
// would take one.
[[nodiscard]] EntryFailure failedStep(int error);

// The library code for a folder that cannot be entered or read: 408 missing or no folder, 407 denied, 402 else.
[[nodiscard]] int folderCodeOf(int error);

// What is opened and what is said of it are kept apart. The path may be that of a folder which the caller holds open
// ("/proc/self/fd/N"): that folder is entered then, wherever it lies by now, while messages, the mount table and
// records go by the path where it was found.
class GivenFolder {
 public:
    explicit GivenFolder(std::string path);
    // A folder that is open as a place (O_PATH), and what it is called.
    GivenFolder(Descriptor place, std::string text) : place_(std::move(place)), text_(std::move(text)) {}

    // Makes it the current directory and opens it for reading. The path is looked up once for both.
    [[nodiscard]] EnteredFolder enter() const;
    [[nodiscard]] const std::string& text() const { return text_; }

 private:
    std::string path_;  // not used where the place is open already
    Descriptor place_;
    std::string text_;
};

}  // namespace orvel

#endif
