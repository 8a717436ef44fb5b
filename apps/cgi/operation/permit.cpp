// Changing permissions, also of what lies below.
#include <fcntl.h>
#include <json/value.h>

#include <cerrno>

#include "folder_names.h"
#include "operation/change_notices.h"
#include "operation/operation.h"
#include "operation/permission_change.h"
#include "operation/permission_item.h"
#include "operation/task_start.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

constexpr int kDeepest = 3000;       // each level costs a descriptor and some of the stack
constexpr size_t kMostAsked = 1000;  // of the chosen items, before it begins

// What the library has no codes for.
constexpr struct {
    int code;
    const char* key;
} kLoss = {2201, "permissions_loss"}, kLink = {2202, "permissions_link"}, kMount = {2203, "permissions_mount"},
  kNotKept = {2204, "permissions_not_kept"}, kNoLists = {2205, "permissions_no_lists"};

class Permit {
 public:
    Permit(Operation& operation, const PermissionChange& change, bool confirmed, Progress& progress)
        : change_(change), confirmed_(confirmed), progress_(progress), notices_(operation) {}

    void run(const Item& item) {
        share_ = &item.info;
        struct stat status {};
        Descriptor opened;
        progress_.begin(item.info.path);
        if (!open(item.place.folder, item.place.name, item.info.path, opened, status)) return;
        if (S_ISLNK(status.st_mode)) return failed(item.info.path, kLink);
        const long long before = progress_.itemsDone();
        device_ = status.st_dev;
        change(item.place.folder, item.place.name, item.info.path, opened, S_ISDIR(status.st_mode), 0);
        if (progress_.itemsDone() != before) notices_.permitted(item);
    }

 private:
    bool open(const Descriptor& folder, const std::string& name, const std::string& path, Descriptor& opened,
              struct stat& status) {
        opened = Descriptor(openat(folder.get(), name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
        if (opened && fstat(opened.get(), &status) == 0) return true;
        progress_.failed(path, OrvParseErrnoToError(errno, nullptr, nullptr));
        return false;
    }
    template <class Reason>
    void failed(const std::string& path, const Reason& reason) {
        progress_.failed(path, reason.code, reason.key);
    }

    // What it is open as is changed, whatever has its name by now.
    void change(const Descriptor& folder, const std::string& name, const std::string& path, const Descriptor& opened,
                bool isFolder, int depth) {
        Permissions now;
        if (!readPermissions(opened, now)) {
            return progress_.failed(path, OrvParseErrnoToError(errno, nullptr, nullptr));
        }
        const Permissions then = changed(now, isFolder, change_);
        // A folder that is about to be closed is closed when nothing is left to be done in it.
        const bool last = (rightsOf(then.access, Holder::kOwner) & (kMayRead | kMayRun)) != (kMayRead | kMayRun);
        if (!last) write(folder, name, path, opened, isFolder, now, then);
        if (isFolder && change_.below) changeBelow(opened, path, depth);
        if (last && !progress_.stopped()) write(folder, name, path, opened, isFolder, now, then);
    }

    void changeBelow(const Descriptor& folder, const std::string& path, int depth) {
        std::vector<std::string> names;
        if (depth == kDeepest) return progress_.failed(path, ORV_ERR_LONG_PATH);
        if (!namesIn(folder.get(), Hidden::kLeaveOut, names)) {
            return progress_.failed(path, OrvParseErrnoToError(errno, nullptr, nullptr));
        }
        for (const std::string& name : names) {
            if (progress_.stopped()) return;
            std::string child = path;
            child.append("/").append(name);
            progress_.begin(child);
            struct stat status {};
            Descriptor opened;
            if (!open(folder, name, child, opened, status)) continue;
            if (S_ISLNK(status.st_mode)) {
                progress_.skipped();
            } else if (status.st_dev != device_) {
                failed(child, kMount);
            } else {
                change(folder, name, child, opened, S_ISDIR(status.st_mode), depth + 1);
            }
        }
    }

    void write(const Descriptor& folder, const std::string& name, const std::string& path, const Descriptor& opened,
               bool isFolder, const Permissions& now, const Permissions& then) {
        if (isSame(now, then)) return progress_.done();
        if (!confirmed_ && lossesOf(now, then, isFolder, actor_) != 0) return failed(path, kLoss);
        const bool written = writePermissions(opened, now, then);
        const int error = errno;
        Permissions after;
        const bool known = readPermissions(opened, after);
        if (known && !isSame(now, after)) {
            progress_.undo().permitted(folder.get(), name, path, textOf(now) + "\n" + textOf(after));
            notices_.refreshed({*share_, folder, name});
        }
        if (!written) {
            if (error == EOPNOTSUPP) return failed(path, kNoLists);
            return progress_.failed(path, OrvParseErrnoToError(error, nullptr, nullptr));
        }
        // Some file systems forget what they cannot keep.
        if (!known || !isSame(after, then)) return failed(path, kNotKept);
        progress_.done();
    }

    const PermissionChange& change_;
    const bool confirmed_;
    Progress& progress_;
    ChangeNotices notices_;
    const Actor actor_ = Actor::ofProcess();
    const PathInfo* share_ = nullptr;
    dev_t device_ = 0;
};

void run(Operation& operation, const PermissionChange& change, bool confirmed, Progress& progress) {
    Choice& chosen = operation.chosen;
    chosen.reportNew(operation.user, progress);
    for (size_t i = 0; i < chosen.size() && !progress.stopped(); ++i) {
        Item item;
        const bool found = change.below && chosen.open(operation.user, i, {Need::kModify}, item) == ORV_ERR_NONE;
        if (found) {
            countItems(item, progress);
        } else {
            progress.expect(1, 0);
        }
    }
    Permit permit(operation, change, confirmed, progress);
    for (size_t i = 0; i < chosen.size() && !progress.stopped(); ++i) {
        Item item;
        const int code = chosen.open(operation.user, i, {Need::kModify}, item);
        if (code == ORV_ERR_NONE) {
            permit.run(item);
        } else {
            progress.failed(chosen.path(i), code);
        }
    }
}

// Of the chosen items; one that cannot be looked at fails later.
unsigned lossesOfChosen(Operation& operation, const PermissionChange& change) {
    unsigned losses = 0;
    const Actor actor = Actor::ofProcess();
    for (size_t i = 0; i < std::min(operation.chosen.size(), kMostAsked); ++i) {
        Item item;
        Descriptor opened;
        Permissions now;
        if (operation.chosen.open(operation.user, i, {Need::kModify}, item) != ORV_ERR_NONE) continue;
        if (S_ISLNK(item.status.st_mode) || !openForPermissions(item, opened) || !readPermissions(opened, now))
            continue;
        const bool isFolder = S_ISDIR(item.status.st_mode);
        unsigned found = lossesOf(now, changed(now, isFolder, change), isFolder, actor);
        // Files below have a rule of their own.
        if (isFolder && change.below) found |= lossesOf(now, changed(now, false, change), false, actor);
        if (losses == 0 && found != 0) operation.culprit = item.info.path;
        losses |= found;
    }
    return losses;
}

Json::Value wordsOf(unsigned losses) {
    constexpr std::pair<unsigned, const char*> kWords[] = {
        {kLosesOwner, "owner"}, {kLosesGroup, "group"}, {kLosesAccess, "access"}, {kLosesSetGid, "set_gid"}};
    Json::Value words(Json::arrayValue);
    for (const auto& [loss, word] : kWords) {
        if ((losses & loss) != 0) words.append(word);
    }
    return words;
}

}  // namespace

int permitOperation(Operation& operation) {
    PermissionChange change;
    const int code = readChange(operation.web, change, operation.data);
    if (code != ORV_ERR_NONE) return code;
    const bool confirmed = operation.web.GetParam("confirm", "") == "true";
    const unsigned losses = confirmed ? 0 : lossesOfChosen(operation, change);
    if (losses != 0) {
        operation.data["warnings"] = wordsOf(losses);
        operation.key = kLoss.key;
        return kLoss.code;
    }
    return startTask(operation, "permit", [&](Progress& progress) { run(operation, change, confirmed, progress); });
}

}  // namespace orvel::cgi
