#include "own_store.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <vector>

#include "base/file.h"
#include "folder_names.h"
#include "vexo/system_root.h"

namespace orvel::cgi {
namespace {

constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

struct Kept {
    std::string name;
    struct stat status;
};

bool isOlder(const Kept& a, const Kept& b) {
    const timespec &left = a.status.st_mtim, &right = b.status.st_mtim;
    return left.tv_sec != right.tv_sec ? left.tv_sec < right.tv_sec : left.tv_nsec < right.tv_nsec;
}

std::vector<Kept> keptIn(const OwnStore& store, const Descriptor& folder) {
    std::vector<std::string> names;
    std::vector<Kept> kept;
    static_cast<void>(namesIn(folder.get(), Hidden::kInclude, names));
    for (const std::string& name : names) {
        Kept one = {name, {}};
        const bool there = fstatat(folder.get(), name.c_str(), &one.status, AT_SYMLINK_NOFOLLOW) == 0;
        if (there && store.isName(name)) kept.push_back(one);
    }
    std::sort(kept.begin(), kept.end(), isOlder);
    return kept;
}

void note(OwnSweep& sweep) {
    if (sweep.error == 0) sweep.error = errno;
}

void sweepFolder(const OwnStore& store, const Descriptor& folder, OwnSweep& sweep) {
    std::vector<std::string> names;
    if (!namesIn(folder.get(), Hidden::kInclude, names)) note(sweep);
    for (const std::string& name : names) {
        struct stat status {};
        if (fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 || !store.isOver(status)) continue;
        if (S_ISREG(status.st_mode) && removeUnheld(folder, name)) ++sweep.removed;
    }
}

}  // namespace

bool OwnStore::isOver(const struct stat& status) const {
    return time(nullptr) - status.st_mtim.tv_sec > seconds;
}

Descriptor openOwnFile(const Descriptor& folder, const std::string& name) {
    return Descriptor(openat(folder.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
}

bool removeUnheld(const Descriptor& folder, const std::string& name) {
    const Descriptor file = openOwnFile(folder, name);
    if (file && !lockFile(file.get(), LOCK_EX | LOCK_NB) && errno == EWOULDBLOCK) return false;
    return unlinkat(folder.get(), name.c_str(), 0) == 0 || errno == ENOENT;
}

bool makeRoom(const OwnStore& store, const Descriptor& folder, long long bytes) {
    const std::vector<Kept> kept = keptIn(store, folder);
    auto count = static_cast<int>(kept.size());
    long long sum = bytes;
    for (const Kept& one : kept) sum += one.status.st_size;
    for (const Kept& one : kept) {
        const bool enough = count < store.mostFiles && sum <= store.mostBytes;
        if ((enough && !store.isOver(one.status)) || !removeUnheld(folder, one.name)) continue;
        --count;
        sum -= one.status.st_size;
    }
    return count < store.mostFiles && sum <= store.mostBytes;
}

OwnSweep sweepOwn(const OwnStore& store) {
    OwnSweep sweep;
    const Descriptor opened(open(VEXO::SystemPath(store.path).c_str(), kOpenFolder));
    std::vector<std::string> users;
    if (!opened && errno == ENOENT) return sweep;
    if (!opened || !namesIn(opened.get(), Hidden::kLeaveOut, users)) note(sweep);
    for (const std::string& user : users) {
        const Descriptor folder(openat(opened.get(), user.c_str(), kOpenFolder));
        if (folder) {
            sweepFolder(store, folder, sweep);
        } else {
            note(sweep);
        }
    }
    return sweep;
}

}  // namespace orvel::cgi
