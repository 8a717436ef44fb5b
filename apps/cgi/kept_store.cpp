#include "kept_store.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <vector>

#include "base/file.h"
#include "base/new_file.h"
#include "base/random.h"
#include "folder_names.h"
#include "user_folder.h"
#include "vexo/system_root.h"

namespace orvel::cgi {
namespace {

constexpr const char* kStore = "/var/lib/vexo/listings";
constexpr size_t kIdLength = 32;
constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

struct Kept {
    std::string id;
    struct stat status;
};

bool isOlder(const Kept& a, const Kept& b) {
    const timespec &left = a.status.st_mtim, &right = b.status.st_mtim;
    return left.tv_sec != right.tv_sec ? left.tv_sec < right.tv_sec : left.tv_nsec < right.tv_nsec;
}

bool isOver(const struct stat& status) {
    return time(nullptr) - status.st_mtim.tv_sec > kKeptSeconds;
}

Descriptor openFile(const Descriptor& folder, const std::string& id) {
    return Descriptor(openat(folder.get(), id.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
}

// False when somebody works with it.
bool removeUnheld(const Descriptor& folder, const std::string& name) {
    const Descriptor file = openFile(folder, name);
    if (file && !lockFile(file.get(), LOCK_EX | LOCK_NB) && errno == EWOULDBLOCK) return false;
    return unlinkat(folder.get(), name.c_str(), 0) == 0 || errno == ENOENT;
}

std::vector<Kept> keptIn(const Descriptor& folder) {
    std::vector<std::string> names;
    std::vector<Kept> kept;
    static_cast<void>(namesIn(folder.get(), Hidden::kInclude, names));
    for (const std::string& name : names) {
        Kept one = {name, {}};
        const bool there = fstatat(folder.get(), name.c_str(), &one.status, AT_SYMLINK_NOFOLLOW) == 0;
        if (there && isKeptId(name)) kept.push_back(one);
    }
    std::sort(kept.begin(), kept.end(), isOlder);
    return kept;
}

// The folder is locked.
bool makeRoom(const Descriptor& folder, long long bytes) {
    const std::vector<Kept> kept = keptIn(folder);
    auto count = static_cast<int>(kept.size());
    long long sum = bytes;
    for (const Kept& one : kept) sum += one.status.st_size;
    for (const Kept& one : kept) {
        const bool enough = count < kMostKept && sum <= kMostKeptBytes;
        if ((enough && !isOver(one.status)) || !removeUnheld(folder, one.id)) continue;
        --count;
        sum -= one.status.st_size;
    }
    return count < kMostKept && sum <= kMostKeptBytes;
}

void note(KeptSweep& sweep) {
    if (sweep.error == 0) sweep.error = errno;
}

void sweepFolder(const Descriptor& folder, KeptSweep& sweep) {
    std::vector<std::string> names;
    if (!namesIn(folder.get(), Hidden::kInclude, names)) note(sweep);
    for (const std::string& name : names) {
        struct stat status {};
        if (fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 || !isOver(status)) continue;
        if (S_ISREG(status.st_mode) && removeUnheld(folder, name)) ++sweep.removed;
    }
}

}  // namespace

bool isKeptId(std::string_view text) {
    return text.size() == kIdLength && text.find_first_not_of(kLowerHex) == std::string_view::npos;
}

KeptResult keepBytes(const std::string& user, std::string_view bytes, std::string& id) {
    const auto size = static_cast<long long>(bytes.size());
    if (size > kMostKeptBytes) return KeptResult::kFull;
    const Descriptor folder = openUserFolder(kStore, user, true);
    id = draw<kIdLength / 2>();
    if (!folder || id.empty()) return KeptResult::kFailed;
    NewFile file(folder.get());
    if (!file.create(id, 0600) || !writeAll(file.get(), bytes)) return KeptResult::kFailed;
    // What comes at the same time is counted, too.
    if (!lockFile(folder.get(), LOCK_EX)) return KeptResult::kFailed;
    if (!makeRoom(folder, size)) return KeptResult::kFull;
    return file.publish(id, false) ? KeptResult::kDone : KeptResult::kFailed;
}

Descriptor openKept(const std::string& user, const std::string& id) {
    errno = ENOENT;
    const Descriptor folder = isKeptId(id) ? openUserFolder(kStore, user, false) : Descriptor();
    Descriptor file = folder ? openFile(folder, id) : Descriptor();
    struct stat status {};
    const bool there = file && fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) && !isOver(status) &&
                       lockFile(file.get(), LOCK_SH | LOCK_NB) && fstat(file.get(), &status) == 0 &&
                       status.st_nlink > 0;
    if (!there || futimens(file.get(), nullptr) != 0) return Descriptor();
    return file;
}

void dropKept(const std::string& user, const std::string& id) {
    const Descriptor folder = isKeptId(id) ? openUserFolder(kStore, user, false) : Descriptor();
    if (folder) static_cast<void>(removeUnheld(folder, id));
}

KeptSweep sweepKeptListings() {
    KeptSweep sweep;
    const Descriptor store(open(VEXO::SystemPath(kStore).c_str(), kOpenFolder));
    std::vector<std::string> users;
    if (!store && errno == ENOENT) return sweep;
    if (!store || !namesIn(store.get(), Hidden::kLeaveOut, users)) note(sweep);
    for (const std::string& user : users) {
        const Descriptor folder(openat(store.get(), user.c_str(), kOpenFolder));
        if (folder) {
            sweepFolder(folder, sweep);
        } else {
            note(sweep);
        }
    }
    return sweep;
}

}  // namespace orvel::cgi
