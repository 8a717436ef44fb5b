#include "orvel/search_walker.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "base/printable.h"
#include "core/boundary.h"
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
    walker_ = std::make_unique<OrvDirectoryWalker>(ENUM_IGNORE_ALL_ERR, cancelFlag_);
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
        const bool done = FILEIDXIsIndexEnable(shareName.c_str()) == 1
                              ? searchIndexed(shareName, folders, accessTimeCriteria)
                              : walkShare(folders);
        if (!done) return false;
    }
    // Whoever waits for the end reads them in another process.
    if (FILEIDXDBFlush(database_.c_str()) < 0) {
        syslog(LOG_ERR, "%s:%d Fail to insert data into DB %s", kSource, __LINE__, orvel::printable(database_).c_str());
    } else if (callback_->lossReason() != 0) {
        // What was met since may have left another error.
        VLIBCErrSetEx(callback_->lossReason(), kSource, __LINE__);
    }
    return true;
}

// Folders that the index cannot know are walked all the same.
bool OrvSearchWalker::searchIndexed(const std::string& shareName, std::vector<PathInfo> folders,
                                    const std::vector<FindATimeComp*>& accessTimeCriteria) {
    const auto unknown = std::stable_partition(folders.begin(), folders.end(), orvel::indexHolds);
    const std::vector<PathInfo> walked(unknown, folders.end());
    folders.erase(unknown, folders.end());
    if (!folders.empty() && !WalkDB(shareName, folders, accessTimeCriteria)) return fail(VEXO_ERR_PARAMETER, __LINE__);
    return walkShare(walked);
}

bool OrvSearchWalker::walkShare(const std::vector<PathInfo>& folders) {
    for (const PathInfo& folder : folders) {
        if (cancelled()) break;
        if (!walkFolder(folder)) return false;
    }
    return true;
}

bool OrvSearchWalker::walkFolder(const PathInfo& folder) {
    struct stat status {};
    if (lstat(folder.realPath.c_str(), &status) != 0) return failStatus(errno, folder.realPath);
    if (!S_ISDIR(status.st_mode)) return true;
    const bool walked = walker_->Walk_FirstFolder_First(folder.shareName, folder.shareRoot, folder.realPath, *callback_,
                                                        &folder.shareName, true, currentFolderOnly_);
    if (walked) return true;
    syslog(LOG_ERR, "%s:%d Fail to walk %s", kSource, __LINE__, orvel::printable(folder.realPath).c_str());
    return fail(static_cast<int>(walked) | VEXO_ERR_PATH, __LINE__);
}

}  // namespace FileSearch
