#include <fcntl.h>

#include <cerrno>

#include "operation/operation.h"
#include "operation/task_start.h"
#include "operation/transfer_job.h"
#include "operation/unpack.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

constexpr size_t kLongestPassword = 1024;

struct Job {
    Operation& operation;
    Conflict conflict;
    PathInfo info;  // the target folder
    Descriptor folder;
    std::string password;
};

int openArchive(const Job& job, size_t position, Item& item, Descriptor& file) {
    const int code = job.operation.chosen.open(job.operation.user, position, {Need::kRead}, item);
    if (code != ORV_ERR_NONE) return code;
    if (!S_ISREG(item.status.st_mode)) return ORV_ERR_ARCHIVE;
    file = Descriptor(
        openat(item.place.folder.get(), item.place.name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    return file ? ORV_ERR_NONE : OrvParseErrnoToError(errno, nullptr, nullptr);
}

// The items are the members; an archive is one more when it fails.
void failed(const std::string& path, int code, Progress& progress) {
    progress.expect(1, 0);
    progress.failed(path, code);
}

void extractOne(const Job& job, size_t position, Progress& progress) {
    const User& user = job.operation.user;
    Item item;
    Descriptor file;
    int code = openArchive(job, position, item, file);
    if (code != ORV_ERR_NONE) return failed(job.operation.chosen.path(position), code, progress);
    Unpacker unpacker(progress, {.folder = job.folder,
                                 .path = job.info.path,
                                 .conflict = job.conflict,
                                 .owner = ownerFor(user.name),
                                 .password = job.password});
    code = unpacker.run(file.get(), UnpackLimits::of(item.status.st_size));
    if (code != ORV_ERR_NONE) failed(item.info.path, code, progress);
    if (unpacker.names().empty()) return;
    // The log knows no kind of its own for it.
    OrvLibDoLog(user.name, item.info.path, unpacker.bytes(), ORVEL_ACTION_COPY, false);
    ShownSearch search(user.name, job.operation.web.GetParam("taskid", ""));
    for (const std::string& name : unpacker.names()) search.added({job.info, job.folder, name});
}

void run(const Job& job, Progress& progress) {
    for (size_t i = 0; i < job.operation.chosen.size(); ++i) {
        Item item;
        Descriptor file;
        if (openArchive(job, i, item, file) == ORV_ERR_NONE) progress.expect(0, item.status.st_size);
    }
    for (size_t i = 0; i < job.operation.chosen.size(); ++i) {
        if (!progress.stopped()) extractOne(job, i, progress);
    }
}

}  // namespace

int extractOperation(Operation& operation) {
    const auto target = bytesParam(operation.web, "target");
    const auto conflict = conflictOf(operation.web.GetParam("conflict", "error"));
    if (!target || !conflict) return ORV_ERR_PARAMETER;
    operation.culprit = *target;
    Job job = {.operation = operation,
               .conflict = *conflict,
               .info = {},
               .folder = Descriptor(),
               .password = operation.web.GetParam("password", "")};
    if (job.password.size() > kLongestPassword) return ORV_ERR_PARAMETER;
    int code = openFolder(operation.user, *target, job.info, job.folder);
    if (code == ORV_ERR_NONE) code = judgeTarget(operation.user, job.info, job.conflict);
    if (code != ORV_ERR_NONE) return code;
    return startTask(operation, "extract", [&job](Progress& progress) { run(job, progress); });
}

}  // namespace orvel::cgi
