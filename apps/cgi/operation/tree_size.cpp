#include "operation/tree_size.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/sysmacros.h>

#include <cerrno>
#include <memory>
#include <utility>

#include "base/file.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr size_t kDeepest = 3000;  // each level costs a descriptor
constexpr int kAsFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_NONBLOCK;
constexpr long long kBlock = 512;

struct CloseDirectory {
    void operator()(DIR* directory) const { closedir(directory); }
};

bool lookAt(int folder, const char* name, struct statx& status) {
    const int flags = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT | (*name == '\0' ? AT_EMPTY_PATH : 0);
    return statx(folder, name, flags, STATX_BASIC_STATS, &status) == 0;
}

bool isMount(const struct statx& status) {
    return (status.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
}

long long diskOf(const struct statx& status) {
    return static_cast<long long>(status.stx_blocks) * kBlock;
}

SizeKind kindOf(const struct statx& status) {
    if (S_ISDIR(status.stx_mode)) return SizeKind::kFolder;
    return S_ISREG(status.stx_mode) ? SizeKind::kFile : SizeKind::kOther;
}

// Removed, or replaced by something else, since its name was read.
bool isGone(int error) {
    return error == ENOENT || error == ENOTDIR || error == ELOOP;
}

}  // namespace

int TreeSize::add(int folder, const std::string& name, const std::string& path, bool ofContent) {
    struct statx status {};
    if (!lookAt(folder, name.c_str(), status)) return errno;
    if (S_ISDIR(status.stx_mode)) {
        Descriptor opened = openFile(folder, name.c_str(), kAsFolder);
        return opened ? add(std::move(opened), path, ofContent) : errno;
    }
    path_ = path;
    ofContent_ = false;
    count(kindOf(status), amountOf(status));
    return 0;
}

int TreeSize::add(Descriptor folder, const std::string& path, bool ofContent) {
    struct statx status {};
    if (!lookAt(folder.get(), "", status)) return errno;
    path_ = path;
    ofContent_ = ofContent;
    push(std::move(folder), diskOf(status));
    walk();
    return 0;
}

void TreeSize::walk() {
    while (!levels_.empty()) {
        Level& level = levels_.back();
        if (progress_.stopped() || level.folders.empty()) {
            leave();
            continue;
        }
        const std::string name = std::move(level.folders.back());
        level.folders.pop_back();
        path_.resize(level.pathLength);
        (path_ += '/') += name;
        enter(name);
    }
}

// Makes the folder at the current path the deepest level.
void TreeSize::push(Descriptor folder, long long disk) {
    Amount own;
    own.folders = 1;
    own.disk = disk;
    report_.total.add(own);
    levels_.push_back({.folder = std::move(folder), .pathLength = path_.size(), .folders = {}, .amount = own});
    progress_.begin(path_);
    read();
}

void TreeSize::read() {
    const int fd = levels_.back().folder.get();
    Descriptor mine(fcntl(fd, F_DUPFD_CLOEXEC, 0));
    const std::unique_ptr<DIR, CloseDirectory> directory(mine ? fdopendir(mine.get()) : nullptr);
    if (directory == nullptr) return miss(errno, {});
    static_cast<void>(mine.release());
    VEXOShareNamesOf(fd);
    while (!progress_.stopped()) {
        errno = 0;
        const dirent* entry = readdir(directory.get());
        if (entry == nullptr) {
            const int error = errno;
            path_.resize(levels_.back().pathLength);
            if (error != 0) miss(error, {});
            return;
        }
        if (VEXOEAIsHiddenFile(entry->d_name) == 0) look(entry->d_name);
    }
}

void TreeSize::look(const char* name) {
    Level& level = levels_.back();
    path_.resize(level.pathLength);
    (path_ += '/') += name;
    struct statx status {};
    if (!lookAt(level.folder.get(), name, status)) {
        if (!isGone(errno)) miss(errno, {});
    } else if (!S_ISDIR(status.stx_mode)) {
        count(kindOf(status), amountOf(status));
    } else if (isMount(status)) {
        Amount mount;
        mount.mounts = 1;
        count(SizeKind::kMount, mount);
    } else {
        level.folders.emplace_back(name);
    }
}

void TreeSize::enter(const std::string& name) {
    Amount seen;
    seen.folders = 1;
    if (levels_.size() == kDeepest) return miss(ENAMETOOLONG, seen);
    Descriptor folder = openFile(levels_.back().folder.get(), name.c_str(), kAsFolder);
    struct statx status {};
    if (!folder || !lookAt(folder.get(), "", status)) {
        if (!isGone(errno)) miss(errno, seen);
        return;
    }
    if (!isMount(status)) return push(std::move(folder), diskOf(status));
    seen.folders = 0;
    seen.mounts = 1;  // since its name was read
    count(SizeKind::kMount, seen);
}

void TreeSize::leave() {
    const Level left = std::move(levels_.back());
    levels_.pop_back();
    path_.resize(left.pathLength);
    if (!levels_.empty()) levels_.back().amount.add(left.amount);
    note(SizeKind::kFolder, left.amount);
}

// Adds what stands at the current path, and nothing below it.
void TreeSize::count(SizeKind kind, const Amount& amount) {
    report_.total.add(amount);
    if (!levels_.empty()) levels_.back().amount.add(amount);
    note(kind, amount);
}

// What was counted, and whole by now, for the lists.
void TreeSize::note(SizeKind kind, const Amount& amount) {
    const bool isPart = levels_.size() == (ofContent_ ? 1 : 0);
    if (isPart) report_.part({path_, kind, amount});
    if (!levels_.empty() && report_.keeps(kind, amount.size)) report_.largest({path_, kind, amount});
}

// `seen`: what is known of it all the same.
void TreeSize::miss(int error, const Amount& seen) {
    Amount amount = seen;
    amount.unreadable = 1;
    report_.unreadable(path_, error);
    report_.total.add(amount);
    levels_.back().amount.add(amount);
    if (seen.folders > 0) note(SizeKind::kFolder, amount);
}

Amount TreeSize::amountOf(const struct statx& status) {
    Amount amount;
    if (!S_ISREG(status.stx_mode)) {
        amount.others = 1;
        amount.disk = diskOf(status);
        return amount;
    }
    amount.files = 1;
    if (status.stx_nlink > 1) {
        const dev_t device = makedev(status.stx_dev_major, status.stx_dev_minor);
        const auto met = linked_.meet(device, status.stx_ino, status.stx_nlink);
        if (met == LinkedFiles::Met::kUnknown) ++report_.linksUnknown;
        if (met == LinkedFiles::Met::kAgain) {
            ++report_.linked;
            return amount;
        }
    }
    amount.size = static_cast<long long>(status.stx_size);
    amount.disk = diskOf(status);
    return amount;
}

}  // namespace orvel::cgi
