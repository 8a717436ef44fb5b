#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <set>

#include "base/file.h"
#include "operation/change_notices.h"
#include "operation/moved_links.h"
#include "operation/operation.h"
#include "operation/permission_item.h"
#include "operation/recycle_item.h"
#include "operation/task_reply.h"
#include "operation/task_start.h"
#include "operation/transfer.h"
#include "operation/transfer_job.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

// What keeps an item where it is, besides what the library has codes for.
constexpr struct {
    int code;
    const char* key;
} kChanged = {2101, "undo_changed"}, kNoSource = {2102, "undo_source"}, kNotEmpty = {2103, "undo_not_empty"};

// Undoes one operation's record.
class Undo {
 public:
    Undo(Operation& operation, const UndoFile& file, Progress& progress)
        : user_(operation.user),
          progress_(progress),
          notices_(operation, "search"),
          byMove_(operation.web.GetParam("taskid", "").find("_move_") != std::string::npos),
          byRecovery_(operation.web.GetParam("taskid", "").find("_recover_") != std::string::npos),
          byRestore_(operation.web.GetParam("taskid", "").find("_restore_") != std::string::npos) {
        UndoItem item;
        for (size_t i = 0; i < file.size(); ++i) {
            if (file.item(i, item) && item.deed == Deed::kMade) made_.insert(item.path);
        }
    }

    // Whether the item is as it was before the operation: undone, or found so.
    bool run(const UndoItem& item) {
        progress_.begin(item.path);
        const bool done = item.deed == Deed::kMoved       ? moveBack(item)
                          : item.deed == Deed::kCopied    ? removeCopy(item)
                          : item.deed == Deed::kMade      ? removeMade(item)
                          : item.deed == Deed::kPermitted ? permitAgain(item)
                                                          : makeAgain(item);
        if (!done) failed_ = item.path;
        return done;
    }

 private:
    bool moveBack(const UndoItem& item);
    bool moveTo(const Item& item, const PathInfo& info, Target& place, Transfer& transfer);
    bool recycle(const Item& item, const RecycleBin& bin);
    bool removeCopy(const UndoItem& item);
    bool removeMade(const UndoItem& item);
    bool makeAgain(const UndoItem& item);
    bool permitAgain(const UndoItem& item);

    // One that was interrupted has moved some items already.
    [[nodiscard]] bool isBack(const UndoItem& item) const {
        Item now;
        return openItem(user_, item.other, {}, now) == ORV_ERR_NONE && isItem(item, now.place.folder.get(), now.status);
    }
    [[nodiscard]] bool isSourceThere(const UndoItem& item) const {
        Item source;
        if (!S_ISREG(item.status.st_mode) || byRecovery_) return true;  // a snapshot is nobody's to look after
        return openItem(user_, item.other, {}, source) == ORV_ERR_NONE && S_ISREG(source.status.st_mode) &&
               source.status.st_size == item.status.st_size &&
               std::abs(source.status.st_mtim.tv_sec - item.status.st_mtim.tv_sec) <= 2;
    }
    bool done() {
        progress_.done();
        return true;
    }
    template <class Reason>
    bool refused(const std::string& path, const Reason& reason) {
        progress_.failed(path, reason.code, reason.key);
        return false;
    }
    bool failed(const std::string& path, int code) {
        progress_.failed(path, code);
        return false;
    }

    const User& user_;
    Progress& progress_;
    ChangeNotices notices_;
    bool byMove_, byRecovery_, byRestore_;
    std::set<std::string> made_;  // folders that the operation made
    std::string failed_;          // the last one that stays
};

// As the move that it is: what leaves a share must be one that may be read. Out of a bin it comes without that.
bool Undo::moveBack(const UndoItem& item) {
    const auto shareOf = [](const std::string& path) { return path.substr(0, path.find('/', 1)); };
    const bool readable = byMove_ || shareOf(item.path) != shareOf(item.other);
    Item now;
    const int code = readable ? openItem(user_, item.path, {Need::kRead, Need::kModify}, now)
                              : openItem(user_, item.path, {Need::kModify}, now);
    if (code == ORV_ERR_MISSING && isBack(item)) return done();
    if (code != ORV_ERR_NONE) return failed(item.path, code);
    if (!isUntouched(item, now.place.folder.get(), now.status)) return refused(item.path, kChanged);

    std::optional<RecycleBin> bin;
    const int binCode = RecycleBin::open(now.info, bin);
    if (byRestore_) {
        // Its folders in the bin went with it, and are as closed as those that it lies in.
        if (binCode != ORV_ERR_NONE || !bin) return failed(item.path, bin ? binCode : ORV_ERR_MISSING);
        return recycle(now, *bin);
    }
    PathInfo info;
    Target place;
    Conflict conflict = Conflict::kError;
    int target = openOrigin(user_, item.other, Missing::kRefuse, conflict, info, place);
    if (target == ORV_ERR_NONE) target = checkNewName(place.folder, place.name);
    if (target == ORV_ERR_NONE && !linksStayInside(now, info, place.folder)) target = ORV_ERR_DENIED;
    struct stat there {};
    const bool taken = target == ORV_ERR_NONE &&
                       fstatat(place.folder.get(), place.name.c_str(), &there, AT_SYMLINK_NOFOLLOW) == 0 &&
                       !isSameFile(there, now.status);
    if (taken) target = ORV_ERR_EXISTS;
    if (target != ORV_ERR_NONE) return failed(item.other, target);

    Transfer transfer(
        progress_,
        {.conflict = Conflict::kError, .move = true, .owner = ownerFor(user_.name), .onFat = isOnFat(place.folder)});
    if (!moveTo(now, info, place, transfer)) return false;
    if (binCode == ORV_ERR_NONE && bin && bin->holds(now)) bin->prune(now);
    return true;
}

bool Undo::moveTo(const Item& item, const PathInfo& info, Target& place, Transfer& transfer) {
    Entry to = {place.folder.get(), place.name, info.path};
    const long long before = progress_.itemsDone();
    const bool whole = transfer.run(item, to);
    if (whole || transfer.bytes() > 0 || progress_.itemsDone() != before) {
        notices_.moved(item, {info, place.folder, to.name}, transfer.bytes(), whole);
    }
    return whole;
}

bool Undo::recycle(const Item& item, const RecycleBin& bin) {
    const bool gone = recycleItem(bin, item, user_, progress_);
    if (gone) notices_.deleted(item.info.path, item.changed(), S_ISDIR(item.status.st_mode), true);
    return gone;
}

// For good: what it was copied from must still be there.
bool Undo::removeCopy(const UndoItem& item) {
    Item now;
    const int code = openItem(user_, item.path, {Need::kModify}, now);
    if (code == ORV_ERR_MISSING) return done();
    if (code != ORV_ERR_NONE) return failed(item.path, code);
    if (S_ISDIR(now.status.st_mode) || !isUntouched(item, now.place.folder.get(), now.status))
        return refused(item.path, kChanged);
    if (!isSourceThere(item)) return refused(item.path, kNoSource);
    if (unlinkat(now.place.folder.get(), now.place.name.c_str(), 0) != 0) {
        return failed(item.path, OrvParseErrnoToError(errno, nullptr, nullptr));
    }
    // Of a folder that was copied only the folder is reported.
    const bool inMade = made_.contains(item.path.substr(0, item.path.rfind('/')));
    if (!inMade) notices_.deleted(now.info.path, now.changed(), false, true);
    return done();
}

bool Undo::removeMade(const UndoItem& item) {
    Item now;
    const int code = openItem(user_, item.path, {Need::kModify}, now);
    if (code == ORV_ERR_MISSING || (code == ORV_ERR_NONE && !isItem(item, now.place.folder.get(), now.status)))
        return done();
    if (code != ORV_ERR_NONE) return failed(item.path, code);
    const bool gone = unlinkat(now.place.folder.get(), now.place.name.c_str(), AT_REMOVEDIR) == 0;
    const int error = errno;
    const bool inMade = made_.contains(item.path.substr(0, item.path.rfind('/')));
    if (!inMade) notices_.deleted(now.info.path, now.changed(), true, gone);
    if (gone) return done();
    if (error != ENOTEMPTY && error != EEXIST) return failed(item.path, OrvParseErrnoToError(error, nullptr, nullptr));
    if (!failed_.starts_with(item.path + "/")) return refused(item.path, kNotEmpty);
    progress_.skipped();  // with what stays in it, of which something was said
    return false;
}

bool Undo::makeAgain(const UndoItem& item) {
    if (byRestore_) return done();  // what goes to the bin has its folders made
    PathInfo info;
    Target place;
    Conflict conflict = Conflict::kError;
    int code = openOrigin(user_, item.path, Missing::kRefuse, conflict, info, place);
    Descriptor made;
    if (code == ORV_ERR_NONE) code = makeFolder(place.folder, place.name, user_.name, made);
    if (code == ORV_ERR_EXISTS) return done();
    if (code != ORV_ERR_NONE) return failed(item.path, code);
    [[maybe_unused]] const int ignored = fchmodat(AT_FDCWD, made.path().c_str(), item.status.st_mode & 0777, 0);
    return done();
}

// What else became of the item since, its content say, is no matter.
bool Undo::permitAgain(const UndoItem& item) {
    const size_t end = item.other.find('\n');
    const auto before = parsePermissions(item.other.substr(0, end));
    const auto after = end == std::string::npos ? std::nullopt : parsePermissions(item.other.substr(end + 1));
    Item found;
    Descriptor opened;
    Permissions now;
    const int code = openItem(user_, item.path, {Need::kModify}, found);
    if (code != ORV_ERR_NONE) return failed(item.path, code);
    const bool readable = !S_ISLNK(found.status.st_mode) && openForPermissions(found, opened);
    struct stat status {};
    const bool same = readable && fstat(opened.get(), &status) == 0 && isItem(item, found.place.folder.get(), status);
    if (!before || !after || !same || !readPermissions(opened, now)) return refused(item.path, kChanged);
    if (isSame(now, *before)) return done();
    if (!isSame(now, *after)) return refused(item.path, kChanged);
    const bool written = writePermissions(opened, now, *before);
    const int error = errno;
    notices_.refreshed(found.changed());
    return written ? done() : failed(item.path, OrvParseErrnoToError(error, nullptr, nullptr));
}

void undoAll(Operation& operation, UndoFile& file, Progress& progress) {
    progress.undo().turnOff();
    progress.expect(static_cast<long long>(file.size()), 0);
    Undo undo(operation, file, progress);
    std::vector<bool> left(file.size(), true);
    UndoItem item;
    // The last first: what lies in a folder was recorded after it.
    for (size_t i = file.size(); i > 0 && !progress.stopped(); --i) {
        if (!file.item(i - 1, item)) {
            progress.broken("", ORV_ERR_GENERAL);
            return;  // what is damaged is not taken for true
        }
        left[i - 1] = !undo.run(item);
    }
    file.keep([&left](size_t position) { return left[position]; });
}

}  // namespace

int undoOperation(Operation& operation) {
    const auto task = taskOf(operation);
    if (task != nullptr && !task->isFinished()) return ORV_ERR_BUSY;
    UndoFile file;
    const int code = file.open(operation.user.name, operation.web.GetParam("taskid", ""));
    if (code != ORV_ERR_NONE) return code;
    return startTask(operation, "undo", [&](Progress& progress) { undoAll(operation, file, progress); });
}

}  // namespace orvel::cgi
