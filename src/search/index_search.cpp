// A search in a share that the file index covers.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>

#include "base/beneath.h"
#include "core/boundary.h"
#include "orvel/search_walker.h"
#include "vexo/index_shown.h"
#include "vexo/user.h"

namespace FileSearch {
namespace {

constexpr unsigned kStatusFlags = VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME;

// One node for each folder; each links to the one before it as an alternative, so the last is the head. A node that
// means any depth, and not the folder's own entries alone, has a second one as its and-link.
class PathConditions {
 public:
    PathConditions(const std::vector<PathInfo>& folders, bool currentOnly)
        : folders_(folders.size()), below_(currentOnly ? 0 : folders.size()) {
        __tag_FI_SQL_COND* previous = nullptr;
        for (std::size_t i = 0; i < folders.size(); ++i) {
            __tag_FI_SQL_COND* andNext = nullptr;
            if (!currentOnly) {
                andNext = &below_[i];
                setSqlCond(*andNext, FI_COL_PATH, FI_OP_BELOW, folders[i].path, nullptr, nullptr);
            }
            setSqlCond(folders_[i], FI_COL_PATH, FI_OP_PATH, folders[i].path, andNext, previous);
            previous = &folders_[i];
        }
    }
    [[nodiscard]] const __tag_FI_SQL_COND* head() const { return &folders_.back(); }

 private:
    std::vector<__tag_FI_SQL_COND> folders_, below_;
};

struct AccessTest {
    orvel::Descriptor root;  // of the share
    const std::vector<FindATimeComp*>& criteria;
};

// Access times change without the index knowing, so the file itself is asked.
BOOL testAccessTime(__tag_FI_FILE_INFO_DATA* record, void* argument) {
    return orvel::guardedQuietly(0, [&] {
        const auto& test = *static_cast<const AccessTest*>(argument);
        const std::string parent = *record->szParent == '\0' ? "." : record->szParent;
        const orvel::Descriptor folder =
            orvel::openBeneath(test.root, parent, orvel::LinkPolicy::kNone, O_PATH | O_DIRECTORY);
        _tag_VEXOSTAT_ status{};
        if (!folder || VLIBCFileLStatAt(folder.get(), record->szName, kStatusFlags, &status) < 0) return 0;
        record->accessed = status.st_access;
        return std::all_of(test.criteria.begin(), test.criteria.end(),
                           [&](FindATimeComp* one) { return (*one)(record->szName, status); })
                   ? 1
                   : 0;
    });
}

BOOL testFolder(const char* folder, void* verdicts) {
    return static_cast<DirPrivilegeMap*>(verdicts)->findDirPrivilege(folder) ? 1 : 0;
}

// An administrator's search runs as root, whom no folder is closed to; one that does not is asked like everybody.
bool seesEverything(const std::string& user) {
    return geteuid() == 0 && VEXOGroupIsAdminGroupMem(user.c_str()) == 1;
}

}  // namespace

bool OrvSearchWalker::WalkDB(const std::string& shareName, const std::vector<PathInfo>& folders,
                             const std::vector<FindATimeComp*>& accessTimeCriteria) {
    return orvel::guardedQuietly(false, [&] { return askIndex(shareName, folders, accessTimeCriteria); });
}

bool OrvSearchWalker::askIndex(const std::string& shareName, const std::vector<PathInfo>& folders,
                               const std::vector<FindATimeComp*>& accessTimeCriteria) {
    if (folders.empty()) return true;
    const PathConditions paths(folders, currentFolderOnly_);
    DirPrivilegeMap verdicts(folders.front().shareRoot, folders);
    const bool asksTimes = !accessTimeCriteria.empty();
    const bool asksFolders = !seesEverything(user_);
    AccessTest times{orvel::Descriptor(open(folders.front().shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)),
                     accessTimeCriteria};
    return FILEIDXResultGetShown(shareName.c_str(), paths.head(), root_, database_.c_str(),
                                 asksTimes ? testAccessTime : nullptr, &times, cancelFlag_,
                                 asksFolders ? testFolder : nullptr, &verdicts, shown_ ? &*shown_ : nullptr) >= 0;
}

}  // namespace FileSearch
