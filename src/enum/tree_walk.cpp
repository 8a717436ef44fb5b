#include "enum/tree_walk.h"

#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "base/printable.h"
#include "core/boundary.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"
#include "vexo/share_files.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";

constexpr unsigned kStatusFlags = 9;  // basic fields and the creation time
constexpr mode_t kFileTypeBits = 0xF000;
constexpr mode_t kFolder = 0x4000;

// Levels whose descriptors stay open above the current one; few enough for any process, and more than trees are deep.
constexpr std::size_t kOpenLevels = 32;

}  // namespace

bool ignoresFailure(_enum_ignore_err_ mode, int error) {
    if (mode == ENUM_IGNORE_ALL_ERR) return true;
    return mode == ENUM_IGNORE_PERMISSION_ERR && (error == EACCES || error == EPERM);
}

bool TreeWalk::run() {
    if (!enterStart()) return false;
    while (!levels_.empty()) {
        if (!step()) return false;
    }
    return true;
}

// The starting folder may be reached through links. A failure that is passed over leaves no level to walk.
bool TreeWalk::enterStart() {
    EnteredFolder entered = start_.enter();
    if (!entered.folder) return passOver(entered.failure, entered.error);
    push(std::move(entered.folder));
    return true;
}

// The next entry of the deepest level, or the way back up. False ends the walk as failed.
bool TreeWalk::step() {
    if (aborted()) return leaveLevel();
    const Level& level = levels_.back();
    return level.nextName < level.endOfNames ? handleEntry() : finishLevel();
}

bool TreeWalk::handleEntry() {
    Level& level = levels_.back();
    level.currentName = level.nextName;
    setEntry(level);
    level.nextName += name_.size() + 1;
    const bool inFirstFolder = levels_.size() == 1;
    if (inFirstFolder && request_.skipRecycle && VEXOShareIsShareRecycle(real_.c_str()) == 1) return true;

    level.status = {};
    if (VLIBCFileLStatAt(level.folder.get(), name_.c_str(), kStatusFlags, &level.status) < 0) {
        return passOverStatus(errno);
    }
    // Noted ahead of the callback, which may change the record.
    const bool isFolder = (level.status.st_mode & kFileTypeBits) == kFolder;
    if (!call(request_.before)) return false;
    if (!isFolder) return call(request_.after);
    if (!inFirstFolder || request_.order == WalkOrder::kDepthFirst) return descend();
    if (request_.order == WalkOrder::kFirstFolderFirst) pending_.push_back(level.currentName);
    return true;
}

bool TreeWalk::handlePending() {
    Level& level = levels_.back();
    level.currentName = pending_[nextPending_++];
    setEntry(level);
    return descend();
}

bool TreeWalk::descend() {
    EnteredFolder entered = enterFolder(levels_.back().folder.get(), name_.c_str());
    if (!entered.folder) return passOver(entered.failure, entered.error) && call(request_.after);
    push(std::move(entered.folder));
    return true;
}

// Makes the folder at the current paths the deepest level and reads its names.
void TreeWalk::push(Descriptor folder) {
    const std::size_t begin = names_.size();
    VEXOShareNamesAt(real_.c_str());
    const int readError = reader_.forEach(folder.get(), [&](const char* name, unsigned char) {
        if (aborted()) return false;
        if (VEXOEAIsHiddenFile(name) == 0) names_.append(name, strlen(name) + 1);
        return true;
    });
    levels_.push_back({.folder = std::move(folder),
                       .identity = {},
                       .firstName = begin,
                       .nextName = begin,
                       .endOfNames = names_.size(),
                       .currentName = begin,
                       .displayLength = display_.size(),
                       .realLength = real_.size(),
                       .readError = readError,
                       .status = {}});
    const std::size_t depth = levels_.size() - 1;
    // The starting folder stays open: the way back down, should a folder move during the walk, begins there.
    if (depth > kOpenLevels) closeFolder(levels_[depth - kOpenLevels]);
}

// One that cannot be identified could not be told from another on the way back, and stays open.
void TreeWalk::closeFolder(Level& level) {
    if (level.folder && identify(level.folder.get(), level.identity)) level.folder.reset();
}

bool TreeWalk::finishLevel() {
    Level& level = levels_.back();
    if (const int error = std::exchange(level.readError, 0); error != 0) {
        real_.resize(level.realLength);
        if (!passOver(EntryFailure::kOpen, error)) return false;
    }
    if (levels_.size() == 1 && nextPending_ < pending_.size()) return handlePending();
    return leaveLevel();
}

// Back to the level above, where the folder just left is the entry being handled.
bool TreeWalk::leaveLevel() {
    const Level left = std::move(levels_.back());
    levels_.pop_back();
    names_.resize(left.firstName);
    if (levels_.empty()) return true;
    if (!levels_.back().folder) reopenDeepest(left.folder.get());
    if (request_.after == nullptr) return true;
    setEntry(levels_.back());
    return call(request_.after);
}

// Opens the deepest level again, from its sub-folder `child` or, when that lies elsewhere now, down from the starting
// folder. Where neither leads back to the same folder, its remaining entries are lost and count as not readable.
void TreeWalk::reopenDeepest(int child) {
    Level& level = levels_.back();
    level.folder = reopenFolder(child, "..", level.identity);
    if (!level.folder) level.folder = openByNames(levels_.size() - 1);
    if (!level.folder && level.nextName < level.endOfNames) {
        level.readError = errno;
        level.nextName = level.endOfNames;
    }
}

// Null with errno when a step fails or meets another folder than before.
Descriptor TreeWalk::openByNames(std::size_t index) const {
    Descriptor folder;
    for (std::size_t i = 0; i < index; ++i) {
        const int parent = i == 0 ? levels_[0].folder.get() : folder.get();
        Descriptor next = reopenFolder(parent, names_.c_str() + levels_[i].currentName, levels_[i + 1].identity);
        if (!next) return next;
        folder = std::move(next);
    }
    return folder;
}

// Sets name and paths to those of the level's current entry.
void TreeWalk::setEntry(const Level& level) {
    name_.assign(names_.c_str() + level.currentName);
    display_.resize(level.displayLength);
    (display_ += '/') += name_;
    real_.resize(level.realLength);
    (real_ += '/') += name_;
}

bool TreeWalk::call(OrvDirectoryWalkerCallBack* callback) {
    return callback == nullptr ||
           (*callback)(display_, request_.context, real_, name_, levels_.back().status, request_.extra);
}

// Cancelled once is cancelled for good.
bool TreeWalk::aborted() {
    cancelled_ = cancelled_ || (request_.abortFlag != nullptr && *request_.abortFlag == 1);
    return cancelled_;
}

bool TreeWalk::passOver(EntryFailure failure, int error) const {
    if (ignoresFailure(request_.mode, error)) return true;
    const std::string path = printable(real_);
    if (failure == EntryFailure::kChangeDirectory) {
        syslog(LOG_ERR, "%s:%d Failed to chdir %s. [%s]", kSource, __LINE__, path.c_str(), strerror(error));
    } else {
        syslog(LOG_ERR, "%s:%d Failed to open %s, error %s", kSource, __LINE__, path.c_str(), strerror(error));
    }
    return false;
}

bool TreeWalk::passOverStatus(int error) const {
    if (ignoresFailure(request_.mode, error)) return true;
    syslog(LOG_ERR, "%s:%d VLIBCFileLStat: (%s), %s, vexoerr=%x.", kSource, __LINE__, printable(real_).c_str(),
           strerror(error), VLIBCErrGet());
    return false;
}

bool walkTree(const WalkRequest& request, const std::string& displayPath, const GivenFolder& start) {
    return guardedQuietly(false, [&] { return TreeWalk(request, displayPath, start).run(); });
}

}  // namespace orvel
