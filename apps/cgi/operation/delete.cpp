#include "operation/change_notices.h"
#include "operation/operation.h"
#include "operation/recycle_item.h"
#include "operation/task_start.h"
#include "operation/tree_remove.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

// Opens the item and the bin that takes it; none when it is to be removed for good. The bin itself goes only when that
// is asked for.
int openItemToDelete(Operation& operation, size_t position, bool permanent, Item& item,
                     std::optional<RecycleBin>& bin) {
    int code = operation.chosen.open(operation.user, position, {Need::kModify}, item);
    if (code != ORV_ERR_NONE || permanent) return code;
    code = RecycleBin::open(item.info, bin);
    if (code != ORV_ERR_NONE || !bin) return code;
    if (bin->is(item)) return ORV_ERR_DENIED;
    if (bin->holds(item)) bin.reset();
    return ORV_ERR_NONE;
}

void expectAll(Operation& operation, bool permanent, Progress& progress) {
    for (size_t i = 0; i < operation.chosen.size(); ++i) {
        Item item;
        std::optional<RecycleBin> bin;
        const bool found = !progress.stopped() && openItemToDelete(operation, i, permanent, item, bin) == 0;
        if (found && !bin) {
            measure(item, progress);
        } else {
            progress.expect(1, 0);
        }
    }
}

void run(Operation& operation, bool permanent, Progress& progress) {
    ChangeNotices notices(operation);
    operation.chosen.reportNew(operation.user, progress);
    expectAll(operation, permanent, progress);
    for (size_t i = 0; i < operation.chosen.size(); ++i) {
        if (progress.stopped()) return;
        Item item;
        std::optional<RecycleBin> bin;
        const int code = openItemToDelete(operation, i, permanent, item, bin);
        if (code != ORV_ERR_NONE) {
            progress.failed(operation.chosen.path(i), code);
            continue;
        }
        const long long before = progress.itemsDone();
        if (!bin) progress.undo().leaveOut();
        const bool gone = bin ? recycleItem(*bin, item, operation.user, progress) : removeTree(item.entry(), progress);
        if (gone || progress.itemsDone() != before) {
            notices.deleted(item.info.path, item.changed(), S_ISDIR(item.status.st_mode), gone);
        }
    }
}

}  // namespace

int deleteOperation(Operation& operation) {
    const bool permanent = operation.web.GetParam("permanent", "") == "true";
    return startTask(operation, "delete", [&](Progress& progress) { run(operation, permanent, progress); });
}

}  // namespace orvel::cgi
