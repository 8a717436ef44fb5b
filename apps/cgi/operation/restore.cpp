#include "operation/change_notices.h"
#include "operation/moved_links.h"
#include "operation/operation.h"
#include "operation/recycle.h"
#include "operation/task_start.h"
#include "operation/transfer.h"
#include "operation/transfer_job.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

void restoreOne(Operation& operation, size_t position, Conflict conflict, ChangeNotices& notices, Progress& progress) {
    const User& user = operation.user;
    Item item;
    int code = operation.chosen.open(user, position, {Need::kModify}, item);
    std::optional<RecycleBin> bin;
    if (code == ORV_ERR_NONE) code = RecycleBin::open(item.info, bin);
    if (code == ORV_ERR_NONE && (!bin || !bin->holds(item))) code = ORV_ERR_PARAMETER;
    PathInfo info;
    Target place;
    if (code == ORV_ERR_NONE) code = openOrigin(user, bin->originOf(item), Missing::kMake, conflict, info, place);
    if (code == ORV_ERR_NONE && !linksStayInside(item, info, place.folder)) {
        removeMadeFolders(place);
        code = ORV_ERR_DENIED;
    }
    if (code != ORV_ERR_NONE) return progress.failed(operation.chosen.path(position), code);

    noteMade(place, info.path, progress.undo());
    Transfer transfer(progress, {.conflict = conflict, .move = true, .owner = ownerFor(user.name), .onFat = false});
    Entry to = {place.folder.get(), place.name, info.path};
    const long long before = progress.itemsDone();
    const bool whole = transfer.run(item, to);
    if (!whole && transfer.bytes() == 0 && progress.itemsDone() == before) return removeMadeFolders(place);
    notices.moved(item, {info, place.folder, to.name}, transfer.bytes(), whole);
    if (whole) bin->prune(item);
}

}  // namespace

int restoreOperation(Operation& operation) {
    const auto conflict = conflictOf(operation.web.GetParam("conflict", "error"));
    if (!conflict) return ORV_ERR_PARAMETER;
    return startTask(operation, "restore", [&](Progress& progress) {
        ChangeNotices notices(operation);
        operation.chosen.reportNew(operation.user, progress);
        progress.expect(static_cast<long long>(operation.chosen.size()), 0);
        for (size_t i = 0; i < operation.chosen.size(); ++i) {
            if (!progress.stopped()) restoreOne(operation, i, *conflict, notices, progress);
        }
    });
}

}  // namespace orvel::cgi
