#include "thumbnail/cache.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <functional>
#include <memory>
#include <vector>

#include "base/file.h"
#include "base/hex.h"
#include "base/new_file.h"
#include "base/raised_identity.h"
#include "base/random.h"
#include "file_system.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace orvel::cgi {
namespace {

constexpr const char* kFolder = "/var/cache/orvel/thumbnails";
constexpr unsigned kShelves = 256;
constexpr unsigned kPutsBetweenLooks = 16;  // at a shelf, on average
constexpr std::int64_t kDefaultMiB = 1024;
constexpr std::int64_t kMostMiB = 1 << 20;
constexpr off_t kLargestKept = 16 << 20;
constexpr time_t kDay = 86400;
constexpr unsigned kMostSeats = 16;

struct Kept {
    std::string name;
    off_t size;
    timespec used;
};

bool isOlder(const Kept& a, const Kept& b) {
    return a.used.tv_sec != b.used.tv_sec ? a.used.tv_sec < b.used.tv_sec : a.used.tv_nsec < b.used.tv_nsec;
}

// Ours, a folder, and nobody else's to write in.
Descriptor openPrivate(int parent, const char* name) {
    Descriptor folder(openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    if (!folder || fstat(folder.get(), &status) != 0) return Descriptor();
    if (status.st_uid == geteuid() && (status.st_mode & 0077) == 0) return folder;
    errno = EACCES;
    return Descriptor();
}

std::int64_t mostBytes() {
    const VexoConf::Info settings;
    const std::string value = settings.Get("thumbnail_cache_mib", "");
    const long long wanted = value.empty() ? kDefaultMiB : strtoll(value.c_str(), nullptr, 10);
    return std::clamp<std::int64_t>(wanted, 0, kMostMiB) << 20;
}

std::vector<Kept> listShelf(int shelf) {
    std::vector<Kept> list;
    const int copy = fcntl(shelf, F_DUPFD_CLOEXEC, 0);
    const std::unique_ptr<DIR, int (*)(DIR*)> folder(copy < 0 ? nullptr : fdopendir(copy), closedir);
    if (folder == nullptr) return list;
    rewinddir(folder.get());
    while (const dirent* entry = readdir(folder.get())) {
        struct stat status {};
        if (fstatat(shelf, entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISREG(status.st_mode)) continue;
        list.push_back({entry->d_name, status.st_blocks * 512, status.st_mtim});
    }
    return list;
}

// Keeps one shelf to its part of the whole: the ones not used for longest go, down to three quarters.
void tidyShelf(int shelf) {
    const std::int64_t most = mostBytes() / kShelves;
    std::vector<Kept> list = listShelf(shelf);
    std::int64_t sum = 0;
    for (const Kept& kept : list) sum += kept.size;
    if (sum <= most) return;
    std::sort(list.begin(), list.end(), isOlder);
    for (const Kept& kept : list) {
        if (sum <= most / 4 * 3) return;
        if (unlinkat(shelf, kept.name.c_str(), 0) == 0) sum -= kept.size;
    }
}

}  // namespace

std::string thumbnailKey(int source, unsigned edge) {
    struct stat status {};
    const std::uint64_t system = fileSystemOf(source);
    if (system == 0 || fstat(source, &status) != 0) return "";
    char key[160];
    snprintf(key, sizeof key, "1-%016llx-%llx-%llx.%09ld-%llx-%u", static_cast<unsigned long long>(system),
             static_cast<unsigned long long>(status.st_ino), static_cast<unsigned long long>(status.st_ctim.tv_sec),
             status.st_ctim.tv_nsec, static_cast<unsigned long long>(status.st_size), edge);
    return key;
}

ThumbnailCache::ThumbnailCache() {
    const RaisedIdentity root;
    const std::string path = VEXO::SystemPath(kFolder);
    root_ = openPrivate(AT_FDCWD, path.c_str());
    if (root_ || errno != ENOENT) return;
    constexpr uid_t kKeep = static_cast<uid_t>(-1);
    if (VEXOFSMkdirP(path.substr(0, path.rfind('/')).c_str(), nullptr, 1, kKeep, kKeep, 0755) != 0) return;
    if (mkdir(path.c_str(), 0700) == 0 || errno == EEXIST) root_ = openPrivate(AT_FDCWD, path.c_str());
}

Descriptor ThumbnailCache::openShelf(const std::string& key, bool make) const {
    std::string name;
    appendHex(static_cast<char>(std::hash<std::string>{}(key) % kShelves), name);
    if (make && mkdirat(root_.get(), name.c_str(), 0700) != 0 && errno != EEXIST) return Descriptor();
    return openPrivate(root_.get(), name.c_str());
}

std::optional<std::string> ThumbnailCache::get(const std::string& key) const {
    const RaisedIdentity root;
    const Descriptor shelf = openShelf(key, false);
    if (!shelf) return std::nullopt;
    const Descriptor file(openat(shelf.get(), key.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    struct stat status {};
    std::string picture;
    if (!file || fstat(file.get(), &status) != 0 || status.st_size > kLargestKept ||
        !readAll(file.get(), picture, static_cast<size_t>(status.st_size))) {
        return std::nullopt;
    }
    if (time(nullptr) - status.st_mtim.tv_sec > kDay) futimens(file.get(), nullptr);
    return picture;
}

void ThumbnailCache::put(const std::string& key, std::string_view picture) const {
    const RaisedIdentity root;
    const Descriptor shelf = openShelf(key, true);
    if (!shelf) return;
    NewFile file(shelf.get());
    if (!file.create(key, 0600)) return;
    if (!writeAll(file.get(), picture)) return;
    static_cast<void>(file.publish(key, false));
    const std::string drawn = draw<1>();
    if (!drawn.empty() && strtoul(drawn.c_str(), nullptr, 16) % kPutsBetweenLooks == 0) tidyShelf(shelf.get());
}

Descriptor ThumbnailCache::takeSeat(int patience) const {
    constexpr int kStep = 20;
    const long processors = sysconf(_SC_NPROCESSORS_ONLN);
    const unsigned seats = std::clamp(static_cast<unsigned>(std::max(processors, 1L)), 1U, kMostSeats);
    for (int waited = 0;; waited += kStep) {
        for (unsigned number = 0; number < seats; ++number) {
            const RaisedIdentity root;
            const std::string name = "seat" + std::to_string(number);
            Descriptor seat(openat(root_.get(), name.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
            if (seat && lockFile(seat.get(), LOCK_EX | LOCK_NB)) return seat;
        }
        if (waited >= patience) return Descriptor();
        usleep(kStep * 1000);
    }
}

}  // namespace orvel::cgi
