#include <fcntl.h>

#include <cerrno>

#include "folder_names.h"
#include "operation/change_notices.h"
#include "operation/operation.h"
#include "operation/recycle.h"
#include "operation/task_start.h"
#include "operation/tree_remove.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

// What stands in the bin, as the user sees it.
std::vector<Item> itemsIn(const RecycleBin& bin, const PathInfo& info, Progress& progress) {
    std::vector<std::string> names;
    if (!namesIn(bin.folder().get(), Hidden::kLeaveOut, names)) {
        progress.broken(bin.sharePath(), OrvParseErrnoToError(errno, nullptr, nullptr));
    }
    std::vector<Item> items(names.size());
    for (size_t i = 0; i < names.size(); ++i) {
        items[i].info = info;
        items[i].info.path = bin.sharePath() + "/" + names[i];
        items[i].info.realPath = info.shareRoot + "/" + bin.name() + "/" + names[i];
        items[i].place.name = names[i];
    }
    return items;
}

// The names stay, one folder is open at a time.
bool look(const RecycleBin& bin, Item& item) {
    item.place.folder = Descriptor(openat(bin.folder().get(), ".", O_PATH | O_DIRECTORY | O_CLOEXEC));
    return fstatat(bin.folder().get(), item.place.name.c_str(), &item.status, AT_SYMLINK_NOFOLLOW) == 0;
}

void run(const Operation& operation, const RecycleBin& bin, const PathInfo& info, Progress& progress) {
    ChangeNotices notices(operation);
    std::vector<Item> items = itemsIn(bin, info, progress);
    for (Item& item : items) {
        if (!progress.stopped() && look(bin, item)) measure(item, progress);
        item.place.folder = Descriptor();
    }
    for (const Item& item : items) {
        if (progress.stopped()) return;
        const long long before = progress.itemsDone();
        const bool gone = removeTree({bin.folder().get(), item.place.name, item.info.path}, progress);
        if (gone || progress.itemsDone() != before) {
            notices.deleted(item.info.path, {info, bin.folder(), item.place.name}, S_ISDIR(item.status.st_mode), gone);
        }
    }
}

}  // namespace

int emptyOperation(Operation& operation) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(operation.user.name.c_str(), operation.chosen.path(0), info)) return lastCode();
    int code = judge(operation.user, info.path, Need::kModify);
    std::optional<RecycleBin> bin;
    if (code == ORV_ERR_NONE) code = RecycleBin::open(info, bin);
    if (code != ORV_ERR_NONE) return code;
    if (!bin) return ORV_ERR_MISSING;
    return startTask(operation, "empty", [&](Progress& progress) { run(operation, *bin, info, progress); });
}

}  // namespace orvel::cgi
