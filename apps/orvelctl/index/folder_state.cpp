#include "index/folder_state.h"

#include <algorithm>
#include <ctime>

namespace orvel::ctl {
namespace {

// Where a file system keeps no time of creation the smaller of the other two stands for it.
bool tellsCreation(const FolderTimes& times) {
    return times.created != std::min(times.modified, times.changed);
}

}  // namespace

FolderState judgeFolder(const FolderTimes& stored, const FolderTimes& found, bool parentChanged) {
    const bool otherOne = tellsCreation(stored) && tellsCreation(found) && stored.created != found.created;
    if (otherOne) return FolderState::kReplaced;
    const bool modified = stored.modified != found.modified;
    if (!modified && stored.changed == found.changed) return FolderState::kSame;
    return !modified && parentChanged ? FolderState::kReplaced : FolderState::kChanged;
}

bool mayChangeUnseen(const FolderTimes& times, int64_t seen) {
    // A time in the far future is not what a change would set.
    const auto isNow = [seen](int64_t time) { return time > seen - kCoarsestTime && time <= seen + kCoarsestTime; };
    return isNow(times.modified) || isNow(times.changed);
}

int64_t kernelClock() {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME_COARSE, &now);
    return now.tv_sec;
}

}  // namespace orvel::ctl
