#include <fcntl.h>

#include <cerrno>
#include <cstdlib>

#include "archive_reader.h"
#include "base/new_file.h"
#include "download/archive.h"
#include "free_names.h"
#include "operation/item.h"
#include "operation/operation.h"
#include "operation/task_start.h"
#include "operation/transfer_job.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "text.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

struct Job {
    Operation& operation;
    Conflict conflict;
    PathInfo info;  // of the archive
    Target place;
    const ArchiveFormat* format;
    std::string password;
};

// Reports the members of the archive as the items of the operation.
class Watch : public ArchiveObserver {
 public:
    explicit Watch(Progress& progress) : progress_(progress) {}
    // What follows lies in this share-relative folder.
    void enter(const std::string& folder) { folder_ = folder; }
    bool begins(const std::string& name) override {
        ended();
        open_ = true;
        progress_.begin(folder_ + "/" + name);
        return !progress_.stopped();
    }
    bool wrote(long long count) override {
        progress_.bytes(count);
        return !progress_.stopped();
    }
    void leftOut(const std::string& name, int error) override {
        open_ = false;
        progress_.failed(folder_ + "/" + name, OrvParseErrnoToError(error, nullptr, nullptr));
    }
    void ended() {
        if (open_) progress_.done();
        open_ = false;
    }

 private:
    Progress& progress_;
    std::string folder_;
    bool open_ = false;
};

void addAll(const Job& job, ArchiveStream& archive, Watch& watch, Progress& progress) {
    FreeNames names;
    Choice& chosen = job.operation.chosen;
    for (size_t i = 0; i < chosen.size(); ++i) {
        Item item;
        int code = chosen.open(job.operation.user, i, {Need::kRead}, item);
        if (code == ORV_ERR_NONE && !S_ISREG(item.status.st_mode) && !S_ISDIR(item.status.st_mode)) {
            code = ORV_ERR_DENIED;
        }
        constexpr int flags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
        const Descriptor opened(code != ORV_ERR_NONE ? -1
                                                     : openat(item.place.folder.get(), item.place.name.c_str(), flags));
        if (code == ORV_ERR_NONE && !opened) code = OrvParseErrnoToError(errno, nullptr, nullptr);
        const bool isFolder = S_ISDIR(item.status.st_mode);
        watch.enter(item.info.path.substr(0, item.info.path.rfind('/')));
        if (code != ORV_ERR_NONE) {
            progress.failed(chosen.path(i), code);
            archive.leaveOut(readable(chosen.path(i)), reasonOf(code));
        } else if (!archive.add(opened, names.take(memberName(item.place.name), isFolder))) {
            return;
        }
    }
}

// Gives the archive its name. 0 with the name, or a library code.
int publish(const Job& job, NewFile& file, std::string& name) {
    const Owner owner = ownerFor(job.operation.user.name);
    if (VEXOShareGiveNew(job.place.folder.get(), file.get(), 0666, 0, owner.uid, owner.gid) != 0) {
        return OrvParseErrnoToError(errno, nullptr, nullptr);
    }
    const std::string wanted = job.place.name;
    name = wanted;
    bool published = file.publish(name, job.conflict == Conflict::kOverwrite);
    for (int number = 2; !published && errno == EEXIST && job.conflict == Conflict::kKeepBoth; ++number) {
        name = numberedName(wanted, number, false);
        published = file.publish(name, false);
    }
    return published ? ORV_ERR_NONE : OrvParseErrnoToError(errno, nullptr, nullptr);
}

int codeOf(const ArchiveStream& archive) {
    const int code = archive.error() == 0 ? ORV_ERR_COMPRESS : OrvParseErrnoToError(archive.error(), nullptr, nullptr);
    return code == ORV_ERR_GENERAL ? ORV_ERR_COMPRESS : code;
}

void run(const Job& job, Progress& progress) {
    Operation& operation = job.operation;
    operation.chosen.reportNew(operation.user, progress);
    for (size_t i = 0; i < operation.chosen.size(); ++i) {
        Item item;
        if (operation.chosen.open(operation.user, i, {Need::kRead}, item) == ORV_ERR_NONE) {
            measure(item, progress);
        } else {
            progress.expect(1, 0);
        }
    }
    NewFile file(job.place.folder.get());
    if (!file.create(job.place.name, 0600))
        return progress.broken(job.info.path, OrvParseErrnoToError(errno, nullptr, nullptr));
    Watch watch(progress);
    // Where the archive itself goes: what is in between counts there, too.
    setenv("TMPDIR", job.place.folder.path().c_str(), 1);
    ArchiveStream archive(file.get(), &watch, job.format->word, job.password);
    addAll(job, archive, watch, progress);
    if (progress.stopped()) return;
    watch.ended();
    // Whoever sees "done" may remove what was packed.
    if (!archive.isWhole()) progress.markFailed();
    if (archive.isEmpty() && !archive.isWhole()) return;
    if (!archive.finish()) return progress.broken(job.info.path, codeOf(archive));
    std::string name;
    const int code = publish(job, file, name);
    if (code != ORV_ERR_NONE) return progress.broken(job.info.path, code);
    // The log knows no kind of its own for it.
    const std::string made = job.info.path.substr(0, job.info.path.rfind('/') + 1) + name;
    OrvLibDoLog(operation.user.name, made, archive.bytes(), ORVEL_ACTION_COPY, false);
    ShownSearch(operation.user.name, operation.web.GetParam("taskid", "")).added({job.info, job.place.folder, name});
}

int openArchive(Operation& operation, const std::string& path, Job& job) {
    const User& user = operation.user;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, job.info)) return lastCode();
    const Conflict wanted = job.conflict;
    int code = judgeTarget(user, job.info, job.conflict);
    if (code != ORV_ERR_NONE) return code;
    code = openTarget(job.info, linkPolicyOf(job.info.shareName), user.name, Missing::kRefuse, job.place);
    if (code != ORV_ERR_NONE) return code;
    code = checkNewName(job.place.folder, job.place.name);
    if (code != ORV_ERR_NONE) return code;
    struct stat there {};
    const bool taken = fstatat(job.place.folder.get(), job.place.name.c_str(), &there, AT_SYMLINK_NOFOLLOW) == 0 &&
                       (job.conflict == Conflict::kError || job.conflict == Conflict::kSkip || !S_ISREG(there.st_mode));
    if (!taken || wanted == Conflict::kKeepBoth) return ORV_ERR_NONE;
    return ORV_ERR_EXISTS;
}

}  // namespace

int compressOperation(Operation& operation) {
    const auto target = bytesParam(operation.web, "target");
    const auto conflict = conflictOf(operation.web.GetParam("conflict", "error"));
    const ArchiveFormat* format = archiveFormatOf(operation.web.GetParam("format", "zip"));
    if (!target || !conflict || format == nullptr) return ORV_ERR_PARAMETER;
    operation.culprit = *target;
    Job job = {.operation = operation,
               .conflict = *conflict,
               .info = {},
               .place = Target(),
               .format = format,
               .password = operation.web.GetParam("password", "")};
    if (!isArchivePassword(job.password) || (!job.password.empty() && !format->takesPassword)) return ORV_ERR_PARAMETER;
    const int code = openArchive(operation, *target, job);
    if (code != ORV_ERR_NONE) return code;
    return startTask(operation, "compress", [&job](Progress& progress) { run(job, progress); });
}

}  // namespace orvel::cgi
