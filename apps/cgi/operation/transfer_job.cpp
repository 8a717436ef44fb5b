#include "operation/transfer_job.h"

#include "operation/change_notices.h"
#include "operation/moved_links.h"
#include "operation/task_start.h"
#include "operation/transfer.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "reply.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

struct Job {
    Operation& operation;
    bool move;
    Conflict conflict;
    PathInfo info;  // the target folder
    Descriptor folder;
};

int openSource(const Job& job, size_t position, Item& item) {
    const User& user = job.operation.user;
    Choice& chosen = job.operation.chosen;
    return job.move ? chosen.open(user, position, {Need::kRead, Need::kModify}, item)
                    : chosen.open(user, position, {Need::kRead}, item);
}

// Whether the item may get a place in the target folder.
int checkPlace(const Job& job, const Item& item) {
    const std::string folder = realPathOf(job.folder);
    if (folder.empty()) return refusalCode(errno, job.info.realPath);
    if (S_ISDIR(item.status.st_mode) && (folder + "/").starts_with(item.realPath() + "/")) {
        return ORV_ERR_SELECT_CONFLICT;  // a folder into itself
    }
    if (!linksStayInside(item, job.info, job.folder)) return ORV_ERR_DENIED;
    return checkNewName(job.folder, item.place.name);
}

void expectAll(const Job& job, Progress& progress) {
    for (size_t i = 0; i < job.operation.chosen.size(); ++i) {
        Item item;
        if (job.move || progress.stopped() || openSource(job, i, item) != ORV_ERR_NONE) {
            progress.expect(1, 0);
        } else {
            measure(item, progress);
        }
    }
}

void run(const Job& job, Progress& progress) {
    ChangeNotices notices(job.operation);
    job.operation.chosen.reportNew(job.operation.user, progress);
    expectAll(job, progress);
    Transfer transfer(progress, {.conflict = job.conflict,
                                 .move = job.move,
                                 .owner = ownerFor(job.operation.user.name),
                                 .onFat = isOnFat(job.folder)});
    Choice& chosen = job.operation.chosen;
    for (size_t i = 0; i < chosen.size(); ++i) {
        if (progress.stopped()) return;
        Item item;
        int code = openSource(job, i, item);
        if (code == ORV_ERR_NONE) code = checkPlace(job, item);
        if (code != ORV_ERR_NONE) {
            progress.failed(chosen.path(i), code);
            continue;
        }
        Entry to = {job.folder.get(), item.place.name, job.info.path + "/" + item.place.name};
        const long long before = progress.itemsDone();
        const bool whole = transfer.run(item, to);
        if (!whole && transfer.bytes() == 0 && progress.itemsDone() == before) continue;
        const ChangedFile there = {job.info, job.folder, to.name};
        if (job.move) {
            notices.moved(item, there, transfer.bytes(), whole);
        } else {
            notices.copied(item, there, transfer.bytes());
        }
    }
}

}  // namespace

bool isOnFat(const Descriptor& folder) {
    return VEXOGetFSType(realPathOf(folder).c_str(), 0) == VEXO_FS_FAT;
}

int judgeTarget(const User& user, const PathInfo& info, Conflict& conflict) {
    // A mode that was chosen: whether there is something at the target shows for each item.
    _tag__type_ mode = conflict == Conflict::kOverwrite ? OVERWRITE_MODE_OVERWRITE : OVERWRITE_MODE_SKIP;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!CheckShareUploadPrivilege(user.name.c_str(), user.sid.c_str(), info.path.c_str(), mode)) return lastCode();
    if (conflict == Conflict::kOverwrite && mode != OVERWRITE_MODE_OVERWRITE) conflict = Conflict::kSkip;
    return ORV_ERR_NONE;
}

int openOrigin(const User& user, const std::string& path, Missing missing, Conflict& conflict, PathInfo& info,
               Target& place) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, info)) return lastCode();
    const int code = judgeTarget(user, info, conflict);
    if (code != ORV_ERR_NONE) return code;
    // Who names the place may have named any.
    const std::string name = info.path.substr(info.path.rfind('/') + 1);
    VEXOShareNamesAt(info.realPath.c_str());
    if (VEXOEAIsHiddenFile(name.c_str()) != 0) return ORV_ERR_RESERVED_NAME;
    return openTarget(info, linkPolicyOf(info.shareName), user.name, missing, place);
}

void noteMade(const Target& place, std::string path, UndoRecord& undo) {
    std::vector<std::string> paths;
    for (size_t i = 0; i < place.made.size(); ++i) {
        path.resize(path.rfind('/'));
        paths.push_back(path);
    }
    for (const MadeFolder& made : place.made) {
        undo.made(made.parent.get(), made.name, paths.back());
        paths.pop_back();
    }
}

int startTransfer(Operation& operation, bool move) {
    const auto target = bytesParam(operation.web, "target");
    const auto conflict = conflictOf(operation.web.GetParam("conflict", "error"));
    if (!target || !conflict) return ORV_ERR_PARAMETER;
    operation.culprit = *target;
    Job job = {.operation = operation, .move = move, .conflict = *conflict, .info = {}, .folder = Descriptor()};
    int code = openFolder(operation.user, *target, job.info, job.folder);
    if (code == ORV_ERR_NONE) code = judgeTarget(operation.user, job.info, job.conflict);
    if (code != ORV_ERR_NONE) return code;
    return startTask(operation, move ? "move" : "copy", [&job](Progress& progress) { run(job, progress); });
}

}  // namespace orvel::cgi
