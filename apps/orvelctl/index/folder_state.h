// Whether a folder is still what the index knows of it.
#ifndef ORVEL_ORVELCTL_INDEX_FOLDER_STATE_H
#define ORVEL_ORVELCTL_INDEX_FOLDER_STATE_H

#include <cstdint>

namespace orvel::ctl {

// Times of a folder in seconds since the epoch.
struct FolderTimes {
    int64_t modified = 0;
    int64_t changed = 0;
    int64_t created = 0;
};

// Seconds that the coarsest file system rounds a time by: FAT counts in twos.
inline constexpr int64_t kCoarsestTime = 2;

enum class FolderState {
    kSame,
    kChanged,  // its entries are compared
    kReplaced  // another folder stands under the name, or may: everything below it is compared
};

// `stored` is what the index has, `found` what the file system says, `parentChanged` whether the folder above is not
// kSame. A folder moved here keeps its time of modification, and moving it changes the folder above.
FolderState judgeFolder(const FolderTimes& stored, const FolderTimes& found, bool parentChanged);

// Whether a change after `seen` (the kernel's clock before the folder was listed) could leave the times as they are:
// seconds are all that the index keeps.
bool mayChangeUnseen(const FolderTimes& times, int64_t seen);

// The clock that times of files are taken from.
int64_t kernelClock();

}  // namespace orvel::ctl

#endif
