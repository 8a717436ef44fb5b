#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "base/new_file.h"
#include "operation/change_notices.h"
#include "operation/operation.h"
#include "operation/recycle_item.h"
#include "operation/task_start.h"
#include "operation/transfer.h"
#include "operation/transfer_job.h"
#include "orvel/error_state.h"
#include "versions/version.h"

namespace orvel::cgi {
namespace {

constexpr int kMostNumbers = 9999;

// Puts what is replaced into the recycle bin. It gets a second name there, so that its own always leads to a file;
// where that is not possible it is moved.
class KeptInBin final : public Replacing {
 public:
    KeptInBin(const RecycleBin& bin, const User& user) : bin_(bin), user_(user) {}

    int keep(const Entry& there, const struct stat& status) override {
        there_ = {there.folder, there.name, there.path};
        status_ = status;
        Item item;
        item.info.path = there.path;
        item.place.folder = Descriptor(fcntl(there.folder, F_DUPFD_CLOEXEC, 0));
        item.place.name = there.name;
        item.realFolder = realPathOf(item.place.folder);
        item.status = status;
        target_ = Target();
        int code = bin_.placeFor(item, ownerFor(user_.name), target_, place_);
        if (code != ORV_ERR_NONE) return code;
        const std::string folder = place_.path.substr(0, place_.path.rfind('/') + 1);
        for (int number = 1; number <= kMostNumbers; ++number) {
            place_.name = binName(there.name, number);
            place_.path = folder + place_.name;
            if (put()) return ORV_ERR_NONE;
            if (errno != EEXIST) break;
        }
        code = OrvParseErrnoToError(errno, nullptr, nullptr);
        removeMadeFolders(target_);
        return code;
    }

    void replaced(UndoRecord& undo) override {
        undo.moved(place_.folder, place_.name, place_.path, there_.path, status_);
        noteInBin(bin_, place_, user_);
    }

    void giveBack() override {
        if (linked_) unlinkat(place_.folder, place_.name.c_str(), 0);
        if (!linked_) static_cast<void>(renameNew(place_.folder, place_.name, there_.folder, there_.name));
        removeMadeFolders(target_);
    }

 private:
    bool put() {
        const char* name = there_.name.c_str();
        linked_ = linkat(there_.folder, name, place_.folder, place_.name.c_str(), 0) == 0;
        return linked_ || (errno != EEXIST && renameNew(there_.folder, there_.name, place_.folder, place_.name));
    }

    const RecycleBin& bin_;
    const User& user_;
    Entry there_{}, place_{};
    struct stat status_ {};
    Target target_;
    bool linked_ = false;
};

struct Recovery {
    Operation& operation;
    std::string version;
    Conflict conflict;
    bool beside;
};

// Opens the version as something to be copied; it is called as what is there now.
int openSource(const Recovery& recovery, size_t position, Version& version, Item& item) {
    Operation& operation = recovery.operation;
    const std::string path = operation.chosen.path(position);
    const int code = openVersion(operation.user, path, recovery.version, Need::kRead, version);
    if (code != ORV_ERR_NONE) return code;
    const size_t slash = version.inside.rfind('/');
    const std::string folder = slash == std::string::npos ? "." : version.inside.substr(0, slash);
    item.info = version.present.info();
    item.place.name = version.inside.substr(slash == std::string::npos ? 0 : slash + 1);
    if (item.place.name == ".") return ORV_ERR_PARAMETER;  // all that a snapshot holds
    item.place.folder = openBeneath(version.root, folder, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    item.realFolder = realPathOf(item.place.folder);
    const bool there = !item.realFolder.empty() && fstatat(item.place.folder.get(), item.place.name.c_str(),
                                                           &item.status, AT_SYMLINK_NOFOLLOW) == 0;
    return there ? static_cast<int>(ORV_ERR_NONE) : refusalCode(errno, item.info.realPath);
}

void expectAll(const Recovery& recovery, Progress& progress) {
    for (size_t i = 0; i < recovery.operation.chosen.size() && !progress.stopped(); ++i) {
        Version version;
        Item item;
        if (openSource(recovery, i, version, item) == ORV_ERR_NONE) {
            measure(item, progress);
        } else {
            progress.expect(1, 0);
        }
    }
}

// What is to be replaced there goes into this bin; none where it lies in the bin itself.
int openBin(const PathInfo& info, const Target& place, std::optional<RecycleBin>& bin) {
    const int code = RecycleBin::open(info, bin);
    if (code != ORV_ERR_NONE || !bin) return code;
    Item there;
    there.place.name = place.name;
    there.realFolder = realPathOf(place.folder);
    if (bin->holds(there)) bin.reset();
    return ORV_ERR_NONE;
}

void recoverOne(const Recovery& recovery, size_t position, ChangeNotices& notices, Progress& progress) {
    Operation& operation = recovery.operation;
    const User& user = operation.user;
    Version version;
    Item item;
    PathInfo info;
    Target place;
    std::optional<RecycleBin> bin;
    Conflict conflict = recovery.beside ? Conflict::kKeepBoth : recovery.conflict;
    int code = openSource(recovery, position, version, item);
    const std::string path = code == ORV_ERR_NONE ? item.info.path : operation.chosen.path(position);
    if (code == ORV_ERR_NONE) code = openOrigin(user, path, Missing::kMake, conflict, info, place);
    if (code == ORV_ERR_NONE) {
        const bool isFolder = S_ISDIR(item.status.st_mode);
        if (recovery.beside) place.name = versionName(place.name, version.snapshot, isFolder);
        code = checkNewName(place.folder, place.name);
        if (code == ORV_ERR_NONE && conflict == Conflict::kOverwrite) code = openBin(info, place, bin);
        if (code != ORV_ERR_NONE) removeMadeFolders(place);
    }
    if (code != ORV_ERR_NONE) return progress.failed(path, code);

    noteMade(place, info.path, progress.undo());
    std::optional<KeptInBin> kept;
    if (bin) kept.emplace(*bin, user);
    const auto judge = [&](const std::string& child) { return version.present.judge(child.substr(path.size() + 1)); };
    Transfer transfer(progress, {.conflict = conflict,
                                 .move = false,
                                 .owner = ownerFor(user.name),
                                 .onFat = isOnFat(place.folder),
                                 .replacing = kept ? &*kept : nullptr,
                                 .judge = judge});
    Entry to = {place.folder.get(), place.name, info.path.substr(0, info.path.rfind('/') + 1) + place.name};
    const long long before = progress.itemsDone();
    const bool whole = transfer.run(item, to);
    if (!whole && transfer.bytes() == 0 && progress.itemsDone() == before) return removeMadeFolders(place);
    notices.copied(item, {info, place.folder, to.name}, transfer.bytes());
}

}  // namespace

int recoverOperation(Operation& operation) {
    const auto version = versionParam(operation.web);
    const auto conflict = conflictOf(operation.web.GetParam("conflict", "error"));
    if (!version || !conflict || operation.chosen.isRows()) return ORV_ERR_PARAMETER;
    const bool beside = operation.web.GetParam("beside", "") == "true";
    const Recovery recovery = {.operation = operation, .version = *version, .conflict = *conflict, .beside = beside};
    return startTask(operation, "recover", [&](Progress& progress) {
        ChangeNotices notices(operation);
        expectAll(recovery, progress);
        for (size_t i = 0; i < operation.chosen.size() && !progress.stopped(); ++i) {
            recoverOne(recovery, i, notices, progress);
        }
    });
}

}  // namespace orvel::cgi
