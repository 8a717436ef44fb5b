#include "upload/store.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <csignal>

#include "base/new_file.h"
#include "download/range.h"
#include "free_names.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/name_check.h"
#include "orvel/share_path.h"
#include "orvel/upload_check.h"
#include "reply.h"
#include "shown_search.h"
#include "temporary_folder.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr int kMostNames = 1000;  // that are tried beside one that is taken
volatile std::sig_atomic_t terminated = 0;

std::string tagOf(const struct stat& status) {
    return entityTag(status.st_ino, status.st_size, status.st_mtim.tv_sec, status.st_mtim.tv_nsec);
}

// The volume's temporary folder is made while the process still may; where it cannot be, the spool says so.
void prepareVolume(std::string volumePath) {
    static_cast<void>(openTemporaryFolder(volumePath));
    static_cast<void>(OrvCreateTmpDir(volumePath.data()));
    umask(022);  // that of every other file
}

// Waits for the target's name, and those of the folders that were made for it.
bool isOnDisk(const Target& target) {
    return syncName(target.folder.get(), target.name) &&
           std::all_of(target.made.begin(), target.made.end(),
                       [](const MadeFolder& made) { return syncName(made.parent.get(), made.name); });
}

}  // namespace

int isCancelled() {
    static const bool watching = [] {
        struct sigaction action {};
        action.sa_handler = [](int) { terminated = 1; };
        return sigaction(SIGTERM, &action, nullptr) == 0;
    }();
    return watching && terminated != 0 ? 1 : 0;
}

int Upload::begin() {
    int code = enter();
    if (code == ORV_ERR_NONE) code = check();
    return code != ORV_ERR_NONE || skipped_ ? code : spool_.open(info_.volumePath);
}

int Upload::enter() {
    OrvLibSetErr(ORV_ERR_NONE);
    if (path_.find('\0') != std::string::npos) return ORV_ERR_PARAMETER;  // would be cut there
    if (!PathInfoFactory::create(user_.name.c_str(), path_, info_)) return lastCode();
    path_ = info_.path;
    if (!OrvCheckReservedName(path_.substr(path_.rfind('/') + 1).c_str())) return lastCode();
    prepareVolume(info_.volumePath);
    const char* user = user_.name.c_str();
    // The share's rules alone, as yet: what is at the path shows once the process is the user (see inspect()).
    _tag__type_ rules = OVERWRITE_MODE_SKIP;
    rules_ = CheckShareUploadPrivilege(user, user_.sid.c_str(), path_.c_str(), rules) ? ORV_ERR_NONE : lastCode();
    return actAs(user_.sid.c_str(), user_.name, IsDirUserHome(path_, nullptr));
}

// Whether what is at the path may be replaced, before the data comes.
int Upload::judge(const Target& target, bool& there) const {
    struct stat status {};
    there = target.folder && fstatat(target.folder.get(), target.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0;
    if (there && condition_.mustBeNew) return kUploadChanged;
    if (there && !S_ISREG(status.st_mode)) return ORV_ERR_EXISTS;
    const bool known = condition_.match.empty() || (there && namesTag(condition_.match, tagOf(status)));
    return known ? static_cast<int>(ORV_ERR_NONE) : kUploadChanged;
}

// What the path leads to, as the user. CheckFile takes a link for no folder, so it is asked about where the links in
// the path lead, which is within the share.
int Upload::inspect() {
    Target target;
    std::string within;
    int code = previewTarget(info_, linkPolicyOf(info_.shareName), target, within);
    if (code == ORV_ERR_PARAMETER && mode_ == OVERWRITE_MODE_ERROR) return ORV_ERR_EXISTS;  // a share's root
    if (code != ORV_ERR_NONE) return code;
    bool there = false;
    code = judge(target, there);
    if (code != ORV_ERR_NONE && !(keepBoth_ && code == ORV_ERR_EXISTS)) return code;
    const std::string share = path_.substr(0, path_.size() - (info_.realPath.size() - info_.shareRoot.size()));
    _tag__type_ beside = OVERWRITE_MODE_SKIP;
    code = CheckFile(share + within, user_.name.c_str(), user_.sid.c_str(), keepBoth_ ? beside : mode_);
    if (code != ORV_ERR_NONE) return code;
    // The share may have made "skip" of it: files that are there stay.
    if (mode_ == OVERWRITE_MODE_SKIP && !condition_.match.empty()) return ORV_ERR_DENIED;
    skipped_ = there && mode_ == OVERWRITE_MODE_SKIP;
    return ORV_ERR_NONE;
}

std::string Upload::folderNow() const {
    Target target;
    std::string within;
    const int code = previewTarget(info_, linkPolicyOf(info_.shareName), target, within);
    return code == ORV_ERR_NONE && target.folder ? folderIdentity(target.folder.get()) : "";
}

int Upload::write(std::string_view data) {
    if (isCancelled() != 0) return ORV_ERR_UPLOAD_CANCELLED;
    return skipped_ ? ORV_ERR_NONE : spool_.write(data);
}

// Gives the data its place, as the mode says. Unless an existing file may be replaced, what came into being since
// begin() is not replaced either.
int Upload::put(const Target& target) {
    if (modified_ && !spool_.setModified(*modified_)) return uploadCodeOf(errno);
    const std::string source = spool_.publish(), place = target.folder.path(target.name);
    if (source.empty()) return uploadCodeOf(errno);
    if (mode_ == OVERWRITE_MODE_OVERWRITE && condition_.match.empty()) {
        OrvLibSetErr(ORV_ERR_NONE);
        return MoveFile(user_.name.c_str(), source.c_str(), place.c_str(), isCancelled) ? ORV_ERR_NONE : lastCode();
    }
    VEXOCOPYOPT options = {.uid = 0, .gid = 0, .isCancelled = isCancelled, .switches = VEXO_COPY_TAKE | VEXO_COPY_SYNC};
    if (modified_) options.switches |= VEXO_COPY_KEEP_TIMES;
    if (VEXOUserGetUGID(user_.name.c_str(), &options.uid, &options.gid) != 0) return ORV_ERR_GENERAL;
    if (!condition_.match.empty()) return replace(source, place, options);
    if (VEXOFileCopy(source.c_str(), place.c_str(), &options) == 0) return ORV_ERR_NONE;
    if (errno == EEXIST && condition_.mustBeNew) return kUploadChanged;
    skipped_ = errno == EEXIST && mode_ == OVERWRITE_MODE_SKIP;
    return skipped_ ? ORV_ERR_NONE : uploadCodeOf(errno);
}

int Upload::isExpected(const struct stat* old, const struct stat* fresh, void* upload) {
    auto& self = *static_cast<Upload*>(upload);
    self.tag_ = tagOf(*fresh);
    return namesTag(self.condition_.match, tagOf(*old)) ? 1 : 0;
}

// In the place of the file that the client knew, whatever happens to the name meanwhile.
int Upload::replace(const std::string& source, const std::string& place, const VEXOCOPYOPT& options) {
    if (VEXOFileReplace(source.c_str(), place.c_str(), &options, isExpected, this) == 0) return ORV_ERR_NONE;
    if (errno == ESTALE) return kUploadChanged;
    return errno == ETXTBSY ? kUploadInUse : uploadCodeOf(errno);
}

// Under the name that was asked for, or one beside it.
int Upload::putNamed(Target& target, const std::function<bool(int number)>& naming) {
    const std::string wanted = target.name;
    for (int number = 1;; ++number) {
        if (naming != nullptr && !naming(number)) return uploadCodeOf(errno);
        const int code = put(target);
        if (!keepBoth_ || code != ORV_ERR_EXISTS || number == kMostNames) return code;
        target.name = numberedName(wanted, number + 1, false);
        path_ = path_.substr(0, path_.rfind('/') + 1) + target.name;
    }
}

int Upload::finish(const std::function<bool(int number)>& naming) {
    if (skipped_) return ORV_ERR_NONE;
    Target target;
    const Missing missing = folder_.empty() ? Missing::kMake : Missing::kRefuse;
    int code = openTarget(info_, linkPolicyOf(info_.shareName), user_.name, missing, target);
    if (code != ORV_ERR_NONE) return code;
    if (!folder_.empty() && folderIdentity(target.folder.get()) != folder_) return ORV_ERR_MISSING;
    code = putNamed(target, naming);
    if (skipped_) return ORV_ERR_NONE;
    if (code != ORV_ERR_NONE) {
        removeMadeFolders(target);
        return code;
    }
    // From here on it is somebody's file, and stays: another upload may have replaced it already.
    if (!isOnDisk(target)) return OrvParseErrnoToError(errno, nullptr, nullptr);
    OrvLibDoLog(user_.name, path_, size(), ORVEL_ACTION_UPLOAD, false);
    ShownSearch(user_.name, search_).added({info_, target.folder, target.name});
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
