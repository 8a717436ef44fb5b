#include "orvel/search_walker.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "base/beneath.h"
#include "base/printable.h"
#include "core/boundary.h"
#include "enum/tree_walk.h"
#include "orvel/search_task.h"
#include "search/indexed_folder.h"
#include "vexo/error.h"

namespace FileSearch {
namespace {

constexpr const char* kSource = "orvelsearch";

bool fail(int platformError, int line) {
    VLIBCErrSetEx(platformError, kSource, line);
    return false;
}

bool failStatus(int reason, const std::string& realPath) {
    switch (reason) {
        case ENOENT:
        case EXDEV:  // the way there leads out of the share by now
            return fail(VEXO_ERR_MISSING, __LINE__);
        case EACCES:
        case EPERM:
            return fail(VEXO_ERR_DENIED, __LINE__);
        default:
            syslog(LOG_ERR, "%s:%d Fail to Stat %s, %s", kSource, __LINE__, orvel::printable(realPath).c_str(),
                   strerror(reason));
            return fail(VEXO_ERR_GENERAL, __LINE__);
    }
}

std::string textOf(const char* text) {
    return text == nullptr ? std::string() : std::string(text);
}

// Opens what stands at the path of a chosen folder, beneath its share's root; a link there is not followed. Null with
// errno.
orvel::Descriptor openPlace(const PathInfo& folder, bool& isFolder) {
    using namespace orvel;
    Descriptor root(open(folder.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!root) return root;
    const std::string path = pathBelow(folder.shareRoot, folder.realPath);
    // Asking for a folder lets a mount on demand take place.
    Descriptor place = openBeneath(root, path, LinkPolicy::kInside, O_PATH | O_NOFOLLOW | O_DIRECTORY);
    isFolder = static_cast<bool>(place);
    if (!isFolder && errno == ENOTDIR) place = openBeneath(root, path, LinkPolicy::kInside, O_PATH | O_NOFOLLOW);
    return place;
}

// Whether the folder is the one that was chosen; the root of a mount may have come over it since.
bool isStill(int folder, const FileMark& mark) {
    struct statx status;
    if (statx(folder, "", AT_EMPTY_PATH, STATX_TYPE, &status) == 0 &&
        (status.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0) {
        return true;
    }
    orvel::FolderIdentity identity{};
    return orvel::identify(folder, identity) && identity.device == mark.device && identity.inode == mark.inode;
}

}  // namespace

OrvSearchWalker::OrvSearchWalker(const char* user, const char* sid, int* cancelFlag)
    : cancelFlag_(cancelFlag), user_(textOf(user)) {
    if (sid != nullptr) sid_ = sid;
}

OrvSearchWalker::~OrvSearchWalker() = default;

void OrvSearchWalker::setSearchCurrentDir(bool currentOnly) {
    currentFolderOnly_ = currentOnly;
}

const char* OrvSearchWalker::getDBTaskId() const {
    return taskId_.c_str();
}

const char* OrvSearchWalker::getDBVol() const {
    return volume_.c_str();
}

bool OrvSearchWalker::init(const std::vector<std::string>& folders, const std::vector<FindComp*>& criteria) {
    const bool ready = orvel::guardedQuietly(false, [&] { return prepare(folders, criteria); });
    if (!ready) {
        taskId_.clear();
        volume_.clear();
    }
    return ready;
}

bool OrvSearchWalker::BuildDirMap(const std::vector<std::string>& folders) {
    if (cancelled()) return true;
    for (const std::string& folder : folders) {
        if (!map_.insertDir(user_.c_str(), sid_ ? sid_->c_str() : nullptr, folder)) return false;
        if (cancelled()) break;
    }
    return true;
}

bool OrvSearchWalker::prepare(const std::vector<std::string>& folders, const std::vector<FindComp*>& criteria) {
    if (criteria.empty()) return fail(VEXO_ERR_PARAMETER, __LINE__);
    if (!BuildDirMap(folders)) return false;
    if (map_.shares().empty()) {
        syslog(LOG_ERR, "%s:%d Fail to find any directory", kSource, __LINE__);
        return fail(VEXO_ERR_DENIED, __LINE__);
    }
    volume_ = map_.shares().begin()->second.front().volumePath;
    if (!makeTask(criteria)) return false;
    for (std::size_t i = 0; i < criteria.size(); ++i) {
        (*criteria[i])(i + 1 < criteria.size() ? criteria[i + 1] : nullptr);
    }
    root_ = criteria.front()->getFirstCond();
    return true;
}

bool OrvSearchWalker::makeTask(const std::vector<FindComp*>& criteria) {
    const OrvSearchDBTask task(volume_.c_str(), user_.c_str(), nullptr);
    taskId_ = task.getDBTaskId();
    database_ = task.getDBTaskFilePath();
    callback_ = std::make_unique<OrvSearchCompWalkerCB>(database_.c_str(), criteria, cancelFlag_);
    if (FILEIDXDBCreate(database_.c_str()) >= 0) return true;
    syslog(LOG_ERR, "%s:%d Fail to ceate DB %s", kSource, __LINE__, orvel::printable(database_).c_str());
    return false;
}

bool OrvSearchWalker::Walk(const std::vector<FindATimeComp*>& accessTimeCriteria) {
    return orvel::guardedQuietly(false, [&] {
        if (taskId_.empty() || volume_.empty()) return fail(VEXO_ERR_PARAMETER, __LINE__);
        return search(accessTimeCriteria);
    });
}

bool OrvSearchWalker::search(const std::vector<FindATimeComp*>& accessTimeCriteria) {
    for (const auto& [shareName, folders] : map_.shares()) {
        if (cancelled()) break;
        if (!searchShare(shareName, folders, accessTimeCriteria)) return false;
    }
    // Whoever waits for the end reads them in another process.
    if (callback_->hasStored() && FILEIDXDBFlush(database_.c_str()) < 0) {
        const int reason = VLIBCErrGet();
        syslog(LOG_ERR, "%s:%d Fail to insert data into DB %s", kSource, __LINE__, orvel::printable(database_).c_str());
        VLIBCErrSetEx(reason, kSource, __LINE__);
    } else {
        // What a walk passed over may have left another error.
        VLIBCErrSetEx(callback_->lossReason(), kSource, __LINE__);
    }
    return true;
}

// What the index cannot know of an indexed share is walked all the same.
bool OrvSearchWalker::searchShare(const std::string& shareName, const std::vector<PathInfo>& folders,
                                  const std::vector<FindATimeComp*>& accessTimeCriteria) {
    const bool hasIndex = FILEIDXIsIndexEnable(shareName.c_str()) == 1;
    std::vector<PathInfo> indexed;
    std::vector<std::size_t> walked;
    for (std::size_t i = 0; i < folders.size(); ++i) {
        if (hasIndex && orvel::indexHolds(folders[i])) {
            indexed.push_back(folders[i]);
        } else {
            walked.push_back(i);
        }
    }
    if (!indexed.empty() && !WalkDB(shareName, indexed, accessTimeCriteria)) return fail(VEXO_ERR_PARAMETER, __LINE__);
    for (const std::size_t i : walked) {
        if (cancelled()) break;
        if (!walkFolder(folders[i], map_.markOf(shareName, i))) return false;
    }
    return true;
}

// The folder is opened when its turn comes, so that many chosen ones do not hold as many descriptors.
bool OrvSearchWalker::walkFolder(const PathInfo& folder, const FileMark& mark) {
    bool isFolder = true;
    orvel::Descriptor place = openPlace(folder, isFolder);
    if (!place) return failStatus(errno, folder.realPath);
    if (!isFolder) return true;
    if (!isStill(place.get(), mark)) return fail(VEXO_ERR_MISSING, __LINE__);
    const auto order = currentFolderOnly_ ? orvel::WalkOrder::kFirstFolderOnly : orvel::WalkOrder::kFirstFolderFirst;
    const orvel::WalkRequest request = {.mode = ENUM_IGNORE_ALL_ERR,
                                        .abortFlag = cancelFlag_,
                                        .context = folder.shareRoot,
                                        .extra = &folder.shareName,
                                        .before = callback_.get(),
                                        .after = nullptr,
                                        .skipRecycle = true,
                                        .order = order};
    const bool walked =
        orvel::walkTree(request, folder.shareName, orvel::GivenFolder(std::move(place), folder.realPath));
    if (walked) return true;
    syslog(LOG_ERR, "%s:%d Fail to walk %s", kSource, __LINE__, orvel::printable(folder.realPath).c_str());
    return fail(static_cast<int>(walked) | VEXO_ERR_PATH, __LINE__);
}

}  // namespace FileSearch
