#include "operation/transfer.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <utility>

#include "base/file.h"
#include "base/new_file.h"
#include "folder_names.h"
#include "orvel/error_state.h"
#include "vexo/copy.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"
#include "vexo/text.h"

namespace orvel::cgi {
namespace {

constexpr int kMostNumbers = 9999;
constexpr int kDeepest = 1000;
constexpr mode_t kUntilFilled = 0700;
constexpr size_t kMostCopied = 1000;  // waited for at once

int codeOfCopy() {
    switch (VLIBCErrGet()) {
        case VEXO_ERR_EXISTS:
        case VEXO_ERR_TARGET_EXISTS:
        case VEXO_ERR_TARGET_EXISTS_OTHER:
            return ORV_ERR_EXISTS;
        case VEXO_ERR_FILE_TOO_LARGE:
            return ORV_ERR_FILE_TOO_BIG;
        default:
            return OrvParseVexoErrToError(VLIBCErrGet(), nullptr);
    }
}

bool isShown(const std::string& name) {
    return VEXOEAIsHiddenFile(name.c_str()) == 0;
}

// Whether a file is as it was when it was looked at.
bool isUnchanged(const struct stat& before, const struct stat& now) {
    return isSameFile(before, now) && before.st_size == now.st_size && before.st_mtim.tv_sec == now.st_mtim.tv_sec &&
           before.st_mtim.tv_nsec == now.st_mtim.tv_nsec;
}

}  // namespace

bool Transfer::FoldedOrder::operator()(const std::string& a, const std::string& b) const {
    return VLIBCUnicodeUTF8StrCaseCmp(a.c_str(), b.c_str()) < 0;
}

Transfer::Result Transfer::failed(const Entry& entry, int code) {
    progress_.failed(entry.path, code);
    return Result::kFailed;
}

Transfer::Result Transfer::failedWith(const Entry& entry, int error) {
    // The only thing that is not valid is then a name that the file system cannot hold.
    if (error == EINVAL && rules_.onFat) return failed(entry, ORV_ERR_FAT_NAME);
    return failed(entry, OrvParseErrnoToError(error, nullptr, nullptr));
}

Transfer::Result Transfer::done() {
    if (!hidden_) progress_.done();
    return Result::kDone;
}

void Transfer::noteMoved(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    if (made_ > 0 || hidden_) return;
    if (replace) {
        progress_.undo().leaveOut();
    } else {
        progress_.undo().moved(to.folder, to.name, to.path, from.path, status);
    }
}

void Transfer::noteCopied(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    if (replace && rules_.replacing == nullptr) {
        progress_.undo().leaveOut();
    } else {
        if (replace) rules_.replacing->replaced(progress_.undo());
        progress_.undo().copied(to.folder, to.name, to.path, from.path, status);
    }
}

bool Transfer::run(const Item& from, Entry& to) {
    top_ = &from;
    topTarget_.reset();
    renaming_ = rules_.move;
    bytes_ = 0;
    return place(from.entry(), from.status, to, taken_) == Result::kDone;
}

// `taken`: the names that were already given in the target's folder.
Transfer::Result Transfer::place(const Entry& from, const struct stat& status, Entry& to, Names& taken) {
    if (progress_.stopped()) return Result::kFailed;
    if (!hidden_) progress_.begin(from.path);
    // Nothing could be asked for by a longer path; each level costs two descriptors and some of the stack.
    if (to.path.size() >= PATH_MAX || depth_ == kDeepest) return failed(from, ORV_ERR_LONG_PATH);
    // One of two names that are one there would replace the other, or mix with it.
    if (rules_.onFat && !taken.insert(to.name).second && rules_.conflict != Conflict::kKeepBoth) {
        return failed(from, ORV_ERR_EXISTS);
    }
    const Result result = make(from, status, to, false);
    return result == Result::kExists ? resolve(from, status, to) : result;
}

Transfer::Result Transfer::resolve(const Entry& from, const struct stat& status, Entry& to) {
    struct stat there {};
    if (fstatat(to.folder, to.name.c_str(), &there, AT_SYMLINK_NOFOLLOW) != 0) {
        return failedWith(from, errno);
    }
    const bool merging = S_ISDIR(status.st_mode) && S_ISDIR(there.st_mode);
    const bool sameKind = (status.st_mode & S_IFMT) == (there.st_mode & S_IFMT);
    if (rules_.conflict == Conflict::kKeepBoth) return keepBoth(from, status, to);
    if (rules_.conflict == Conflict::kSkip && !merging) {
        progress_.skipped();
        return Result::kFailed;
    }
    if (rules_.conflict == Conflict::kError || !sameKind) return failed(from, ORV_ERR_EXISTS);
    if (isSameFile(status, there)) return failed(from, ORV_ERR_SELECT_CONFLICT);
    return merging || rules_.replacing == nullptr ? make(from, status, to, true) : replace(from, status, to, there);
}

Transfer::Result Transfer::replace(const Entry& from, const struct stat& status, const Entry& to,
                                   const struct stat& there) {
    const int code = rules_.replacing->keep(to, there);
    if (code != ORV_ERR_NONE) return failed(to, code);
    const Result result = make(from, status, to, true);
    if (result != Result::kDone) rules_.replacing->giveBack();
    return result;
}

Transfer::Result Transfer::keepBoth(const Entry& from, const struct stat& status, Entry& to) {
    const std::string name = to.name, folder = to.path.substr(0, to.path.rfind('/') + 1);
    int inThisFolder = 1;
    // Thousands of one name, from as many folders, do not each ask for all numbers again.
    int& number = depth_ == 0 ? numbers_.try_emplace(to.path, 1).first->second : inThisFolder;
    while (++number <= kMostNumbers) {
        to.name = rules_.nextName(name, number, S_ISDIR(status.st_mode));
        to.path = folder + to.name;
        const Result result = make(from, status, to, false);
        if (result != Result::kExists) return result;
    }
    return failed(from, ORV_ERR_EXISTS);
}

// `replace`: in the place of what is there, which is of the same kind; folders are merged.
Transfer::Result Transfer::make(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    return renaming_ ? rename(from, status, to, replace) : copy(from, status, to, replace);
}

Transfer::Result Transfer::rename(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    if (replace && S_ISDIR(status.st_mode)) return fill(from, status, to, false);
    const bool renamed = replace ? renameat(from.folder, from.name.c_str(), to.folder, to.name.c_str()) == 0
                                 : renameNew(from.folder, from.name, to.folder, to.name);
    if (renamed) noteMoved(from, status, to, replace);
    if (renamed) return done();
    if (errno == EXDEV) {
        renaming_ = false;
        // It is now that there are bytes to be moved; the item itself was expected.
        measure(*top_, progress_);
        progress_.expect(-1, 0);
        return copy(from, status, to, replace);
    }
    return errno == EEXIST || errno == ENOTEMPTY ? Result::kExists : failedWith(from, errno);
}

Transfer::Result Transfer::copy(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    if (S_ISDIR(status.st_mode)) return replace ? fill(from, status, to, false) : makeFolder(from, status, to);
    Result result = Result::kFailed;
    if (S_ISREG(status.st_mode)) {
        result = copyFile(from, status, to, replace);
    } else if (S_ISLNK(status.st_mode)) {
        result = copyLink(from, status, to, replace);
    } else {
        return failed(from, ORV_ERR_GENERAL);
    }
    return result == Result::kDone ? arrived(from, status, to, replace) : result;
}

// A file or link is copied. Of a move it is still to be removed: those in a folder together, as waiting for the disk
// takes long.
Transfer::Result Transfer::arrived(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    if (!rules_.move) {
        noteCopied(from, status, to, replace);
        return done();
    }
    if (depth_ > 0) {
        copied_.push_back({from.name, to.name, status, replace});
        return Result::kDone;
    }
    if (!syncName(to.folder, to.name)) return failedWith(from, errno);
    if (removeSource(from, status) != Result::kDone) return Result::kFailed;
    noteMoved(from, status, to, replace);
    return done();
}

Transfer::Result Transfer::copyFile(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    unsigned switches = VEXO_COPY_KEEP_TIMES | VEXO_COPY_KEEP_MODE;
    if (replace) switches |= VEXO_COPY_OVERWRITE;
    if (rules_.move && depth_ == 0) switches |= VEXO_COPY_SYNC;  // see arrived()
    const VEXOCOPYOPT options = {
        .uid = rules_.owner.uid, .gid = rules_.owner.gid, .isCancelled = Progress::askDuringCopy, .switches = switches};
    if (VEXOFileCopy(from.handle().c_str(), to.handle().c_str(), &options) == 0) {
        bytes_ += status.st_size;
        if (!hidden_) progress_.bytes(status.st_size);
        return Result::kDone;
    }
    if (VLIBCErrGet() == VEXO_ERR_CANCELLED) return Result::kFailed;
    const int code = codeOfCopy();
    return code == ORV_ERR_EXISTS && !replace ? Result::kExists : failed(from, code);
}

Transfer::Result Transfer::copyLink(const Entry& from, const struct stat& status, const Entry& to, bool replace) {
    std::array<char, PATH_MAX> text{};
    if (readlinkat(from.folder, from.name.c_str(), text.data(), text.size() - 1) < 0) return failedWith(from, errno);
    if (!putLink(to.folder, to.name, text.data(), replace)) {
        return errno == EEXIST ? Result::kExists : failedWith(from, errno);
    }
    const std::array<timespec, 2> times = {status.st_atim, status.st_mtim};
    utimensat(to.folder, to.name.c_str(), times.data(), AT_SYMLINK_NOFOLLOW);
    [[maybe_unused]] const int ignored =
        fchownat(to.folder, to.name.c_str(), rules_.owner.uid, rules_.owner.gid, AT_SYMLINK_NOFOLLOW);
    return Result::kDone;
}

Transfer::Result Transfer::makeFolder(const Entry& from, const struct stat& status, const Entry& to) {
    if (mkdirat(to.folder, to.name.c_str(), kUntilFilled) != 0) {
        return errno == EEXIST ? Result::kExists : failedWith(from, errno);
    }
    if (!rules_.move) {
        progress_.undo().made(to.folder, to.name, to.path);
        return fill(from, status, to, true);
    }
    // What is removed for the sake of a copy in it must not be lost with it.
    if (syncName(to.folder, to.name)) {
        ++made_;
        const Result result = fill(from, status, to, true);
        --made_;
        if (result == Result::kDone) noteMoved(from, status, to, false);
        if (result != Result::kDone && made_ == 0) progress_.undo().leaveOut();
        return result;
    }
    const int error = errno;
    unlinkat(to.folder, to.name.c_str(), AT_REMOVEDIR);
    return failedWith(from, error);
}

// What a new folder takes over from its source once it is filled.
void Transfer::makeAlike(const Entry& to, const Descriptor& folder, const struct stat& status) const {
    const std::array<timespec, 2> times = {status.st_atim, status.st_mtim};
    VEXOShareGiveNew(to.folder, folder.get(), status.st_mode & 0777, VEXO_NEW_OWN_MODE, rules_.owner.uid,
                     rules_.owner.gid);
    futimens(folder.get(), times.data());
}

// `made`: the folder is new.
Transfer::Result Transfer::fill(const Entry& from, const struct stat& status, const Entry& to, bool made) {
    constexpr int flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    const Descriptor source(openat(from.folder, from.name.c_str(), flags));
    const Descriptor target(source ? openat(to.folder, to.name.c_str(), flags) : -1);
    struct stat inside {};
    if (!target || fstat(target.get(), &inside) != 0) {
        const int error = errno;
        if (made) unlinkat(to.folder, to.name.c_str(), AT_REMOVEDIR);
        return failedWith(from, error);
    }
    if (!topTarget_) topTarget_ = inside;
    // The tree may lie in itself by way of a mount.
    if (isSameFile(status, *topTarget_)) return failed(from, ORV_ERR_SELECT_CONFLICT);
    if (made) {
        [[maybe_unused]] const int ignored = fchown(target.get(), rules_.owner.uid, rules_.owner.gid);
    }
    const bool all = fillWhole(from, source, to, target);
    if (made) makeAlike(to, target, status);
    if (progress_.stopped()) return Result::kFailed;
    if (!all && rules_.move) {
        progress_.skipped();  // it stays, with what stayed in it
        return Result::kFailed;
    }
    if (rules_.move && removeSource(from, status) != Result::kDone) return Result::kFailed;
    if (rules_.move && !made && made_ == 0 && !hidden_) progress_.undo().removed(from.path, status);
    static_cast<void>(done());
    return all ? Result::kDone : Result::kFailed;
}

// One level down: with everything that waits to be removed there.
bool Transfer::fillWhole(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target) {
    std::vector<Copied> above = std::exchange(copied_, {});
    ++depth_;
    bool all = fillFrom(from, source, to, target);
    all = removeCopied(from, source, to, target) && all;
    --depth_;
    copied_ = std::move(above);
    return all;
}

bool Transfer::fillFrom(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target) {
    std::vector<std::string> names;
    bool all = namesIn(source.get(), rules_.move ? Hidden::kInclude : Hidden::kLeaveOut, names);
    if (!all) failedWith(from, errno);
    VEXOShareNamesOf(source.get());
    if (renaming_ && !hidden_) progress_.expect(std::count_if(names.begin(), names.end(), isShown), 0);
    Names taken;
    const bool hidden = hidden_;
    for (const std::string& name : names) {
        if (progress_.stopped()) return false;
        if (isPartName(name)) {  // not to be moved: somebody's at work, or nobody's
            all = (!rules_.move || removeAbandonedPart(source.get(), name)) && all;
            continue;
        }
        const Entry child = from.child(source.get(), name);
        Entry childTo = to.child(target.get(), name);
        struct stat status {};
        VEXOShareNamesOf(source.get());
        hidden_ = hidden || !isShown(name);
        VEXOShareNamesOf(target.get());
        if (VEXOShareVetoes(name.c_str()) != 0) {
            if (!hidden_) failed(child, ORV_ERR_RESERVED_NAME);
            all = false;
            continue;
        }
        const int refusal = rules_.judge ? rules_.judge(child.path) : static_cast<int>(ORV_ERR_NONE);
        if (refusal != ORV_ERR_NONE) {
            failed(child, refusal);
            all = false;
        } else if (fstatat(child.folder, child.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
            failedWith(child, errno);
            all = false;
        } else {
            all = place(child, status, childTo, taken) == Result::kDone && all;
        }
        hidden_ = hidden;
        if (copied_.size() >= kMostCopied) all = removeCopied(from, source, to, target) && all;
    }
    return all;
}

bool Transfer::isOnDisk(const Copied& copied, const Descriptor& target) {
    if (S_ISLNK(copied.status.st_mode)) return true;  // with its folder
    const Descriptor file(
        openat(target.get(), copied.copy.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    // One that may not be read was waited for with the file system.
    return file ? fsync(file.get()) == 0 : errno == EACCES;
}

// Removes from the folder `from` what was copied out of it, once that is on the disk. True when all of it is gone.
bool Transfer::removeCopied(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target) {
    const std::vector<Copied> copied = std::exchange(copied_, {});
    if (copied.empty()) return true;
    // All at once: each file's own waiting, which alone some file systems know, is short then.
    const int failure = syncfs(target.get()) == 0 ? 0 : errno;
    std::vector<const Copied*> safe;
    for (const Copied& one : copied) {
        if (failure == 0 && isOnDisk(one, target)) {
            safe.push_back(&one);
        } else {
            failedWith(from.child(source.get(), one.name), failure != 0 ? failure : errno);
        }
    }
    if (!safe.empty() && !syncName(target.get(), safe.front()->copy)) {
        failedWith(from, errno);
        return false;
    }
    const bool hidden = hidden_;
    bool all = safe.size() == copied.size();
    for (const Copied* one : safe) {
        VEXOShareNamesOf(source.get());
        hidden_ = hidden || !isShown(one->name);
        const Entry child = from.child(source.get(), one->name);
        const bool removed = removeSource(child, one->status) == Result::kDone;
        if (removed) noteMoved(child, one->status, to.child(target.get(), one->copy), one->replaced);
        if (removed) static_cast<void>(done());
        all = removed && all;
    }
    hidden_ = hidden;
    return all;
}

// After a copy: the source is removed unless it is not what was copied any more.
Transfer::Result Transfer::removeSource(const Entry& from, const struct stat& status) {
    const char* name = from.name.c_str();
    if (S_ISDIR(status.st_mode)) {
        return unlinkat(from.folder, name, AT_REMOVEDIR) == 0 ? Result::kDone : failedWith(from, errno);
    }
    struct stat now {};
    if (fstatat(from.folder, name, &now, AT_SYMLINK_NOFOLLOW) != 0) return failedWith(from, errno);
    if (!isUnchanged(status, now)) return failed(from, ORV_ERR_BUSY);
    return unlinkat(from.folder, name, 0) == 0 ? Result::kDone : failedWith(from, errno);
}

}  // namespace orvel::cgi
