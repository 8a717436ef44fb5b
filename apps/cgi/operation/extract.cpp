#include <fcntl.h>

#include <cerrno>

#include "archive_reader.h"
#include "memory_limit.h"
#include "operation/member_path.h"
#include "operation/operation.h"
#include "operation/own_folder.h"
#include "operation/task_start.h"
#include "operation/transfer_job.h"
#include "operation/unpack.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "text.h"

namespace orvel::cgi {
namespace {

struct Job {
    Operation& operation;
    Conflict conflict;
    PathInfo info;  // the target folder
    Descriptor folder;
    std::string password;
    bool ownFolder = false;
    std::vector<std::string> inside;  // see Unpacker::Target
    std::set<std::string> chosen;
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

// What goes wrong with the archive, and not with a member.
void failedWith(const std::string& path, int code, Progress& progress) {
    for (const ArchiveRefusal& own : {kArchiveLocked, kArchiveDemanding}) {
        if (code != own.code) continue;
        progress.expect(1, 0);
        return progress.failed(path, own.code, own.key);
    }
    failed(path, code, progress);
}

std::string joined(const std::vector<std::string>& components) {
    std::string path;
    for (const std::string& component : components) path += "/" + component;
    return path;
}

// Unpacks the open archive into the folder. False when not all of it could be read.
bool unpackInto(const Job& job, const Descriptor& folder, const std::string& path, const Item& item, int file,
                Progress& progress, std::set<std::string>& names) {
    Unpacker unpacker(progress, {.folder = folder,
                                 .path = path,
                                 .conflict = job.conflict,
                                 .owner = ownerFor(job.operation.user.name),
                                 .password = job.password,
                                 .inside = job.inside,
                                 .chosen = job.chosen});
    const int code = unpacker.run(file, UnpackLimits::of(item.status.st_size));
    if (code != ORV_ERR_NONE) failedWith(item.info.path, code, progress);
    if (code == ORV_ERR_NONE && !progress.stopped()) {
        for (const std::string& name : unpacker.missing())
            failed(item.info.path + joined(job.inside) + "/" + name, ORV_ERR_MISSING, progress);
    }
    names = unpacker.names();
    // The log knows no kind of its own for it.
    if (!names.empty())
        OrvLibDoLog(job.operation.user.name, item.info.path, unpacker.bytes(), ORVEL_ACTION_COPY, false);
    return code == ORV_ERR_NONE;
}

void extractOne(const Job& job, size_t position, Progress& progress) {
    const User& user = job.operation.user;
    Item item;
    Descriptor file;
    int code = openArchive(job, position, item, file);
    if (code != ORV_ERR_NONE) return failed(job.operation.chosen.path(position), code, progress);
    std::set<std::string> names;
    if (job.ownFolder) {
        OwnFolder own(job.folder);
        code = own.make(folderNameOf(item.place.name), user.name);
        if (code != ORV_ERR_NONE) return failed(item.info.path, code, progress);
        const std::string path = job.info.path + "/" + own.name();
        const bool whole = unpackInto(job, own.folder(), path, item, file.get(), progress, names);
        own.settle(whole && !progress.stopped());
        names = own.isThere() ? std::set<std::string>{own.name()} : std::set<std::string>();
    } else {
        unpackInto(job, job.folder, job.info.path, item, file.get(), progress, names);
    }
    if (names.empty()) return;
    ShownSearch search(user.name, job.operation.web.GetParam("taskid", ""));
    for (const std::string& name : names) search.added({job.info, job.folder, name});
}

void run(const Job& job, Progress& progress) {
    boundMemory(kArchiveMemory);
    for (size_t i = 0; i < job.operation.chosen.size(); ++i) {
        Item item;
        Descriptor file;
        if (openArchive(job, i, item, file) == ORV_ERR_NONE) progress.expect(0, item.status.st_size);
    }
    for (size_t i = 0; i < job.operation.chosen.size(); ++i) {
        if (!progress.stopped()) extractOne(job, i, progress);
    }
}

// What is wanted of the archive. False for what cannot be names in it.
bool readChosen(const Operation& operation, Job& job) {
    const auto folder = bytesParam(operation.web, "inside");
    const auto inside = memberComponents(folder.value_or(""));
    if (!folder || (!folder->empty() && !inside)) return false;
    job.inside = inside.value_or(std::vector<std::string>());
    for (const std::string& line : linesParam(operation.web, "members_raw")) {
        const auto name = percentDecode(line);
        const auto components = memberComponents(name.value_or(""));
        if (!components || components->size() != 1) return false;
        job.chosen.insert(components->front());
    }
    return (job.inside.empty() && job.chosen.empty()) || operation.chosen.size() == 1;
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
               .password = operation.web.GetParam("password", ""),
               .ownFolder = operation.web.GetParam("own_folder", "") == "true",
               .inside = {},
               .chosen = {}};
    if (!isArchivePassword(job.password) || !readChosen(operation, job)) return ORV_ERR_PARAMETER;
    int code = openFolder(operation.user, *target, job.info, job.folder);
    if (code == ORV_ERR_NONE) code = judgeTarget(operation.user, job.info, job.conflict);
    if (code != ORV_ERR_NONE) return code;
    return startTask(operation, "extract", [&job](Progress& progress) { run(job, progress); });
}

}  // namespace orvel::cgi
