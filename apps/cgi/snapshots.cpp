#include "snapshots.h"

#include <dirent.h>
#include <fcntl.h>
#include <linux/btrfs.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <memory>

#include "base/beneath.h"
#include "base/file.h"
#include "confined.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostNames = 20000;  // in one shelf
constexpr size_t kMostRecord = 65536;
constexpr int kMostAbove = 1000;
constexpr ino_t kSubvolume = 256;  // the inode of every subvolume's root
constexpr const char* kSnapper = ".snapshots";
constexpr const char* kZfs = ".zfs/snapshot";

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

bool isNumber(std::string_view name) {
    return !name.empty() && std::all_of(name.begin(), name.end(), isDigit);
}

std::optional<time_t> timeOf(std::tm fields, bool isLocalTime) {
    const std::tm asked = fields;
    fields.tm_isdst = -1;
    const time_t time = isLocalTime ? mktime(&fields) : timegm(&fields);
    // A day that the month does not have would become another one.
    const bool same =
        fields.tm_year == asked.tm_year && fields.tm_mon == asked.tm_mon && fields.tm_mday == asked.tm_mday;
    return same ? std::optional(time) : std::nullopt;
}

// Takes `count` digits off the beginning; -1 where there are fewer.
int takeNumber(std::string_view& text, size_t count) {
    if (text.size() < count || !isNumber(text.substr(0, count))) return -1;
    int number = 0;
    for (size_t i = 0; i < count; ++i) number = number * 10 + (text[i] - '0');
    text.remove_prefix(count);
    return number;
}

void skipOneOf(std::string_view& text, std::string_view separators) {
    if (!text.empty() && separators.find(text.front()) != std::string_view::npos) text.remove_prefix(1);
}

// A date, and where it follows a time of day, at the beginning of `text`.
std::optional<std::tm> dateAt(std::string_view text) {
    std::tm fields{};
    const int year = takeNumber(text, 4);
    skipOneOf(text, "-._");
    const int month = takeNumber(text, 2);
    skipOneOf(text, "-._");
    const int day = takeNumber(text, 2);
    if (year < 1980 || year > 2999 || month < 1 || month > 12 || day < 1 || day > 31) return std::nullopt;
    fields.tm_year = year - 1900;
    fields.tm_mon = month - 1;
    fields.tm_mday = day;
    skipOneOf(text, "-_T. ");
    const int hour = takeNumber(text, 2);
    skipOneOf(text, ":.-h");
    const int minute = takeNumber(text, 2);
    if (hour < 0 || hour > 23 || minute < 0 || minute > 59) return fields;
    fields.tm_hour = hour;
    fields.tm_min = minute;
    skipOneOf(text, ":.-");
    const int second = takeNumber(text, 2);
    if (second >= 0 && second < 60) fields.tm_sec = second;
    return fields;
}

// snapper keeps "<date>2026-11-01 12:00:00</date>", UTC, in N/info.xml.
std::optional<time_t> dateInRecord(const Shelf& shelf, const std::string& name) {
    constexpr std::string_view kBegin = "<date>";
    const Descriptor file =
        openBeneath(shelf.folder, name + "/info.xml", LinkPolicy::kNone, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    std::string text;
    if (!file || fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
    if (!readAll(file.get(), text, kMostRecord)) return std::nullopt;
    const size_t begin = text.find(kBegin);
    if (begin == std::string::npos) return std::nullopt;
    const std::string date = text.substr(begin + kBegin.size(), text.find('<', begin + 1) - begin - kBegin.size());
    return dateByFormat(date, "%Y-%m-%d %H:%M:%S", false);
}

// When a btrfs snapshot was made; nothing for any other folder.
std::optional<time_t> dateInFileSystem(const Descriptor& snapshot) {
    struct stat status {};
    if (fstat(snapshot.get(), &status) != 0 || status.st_ino != kSubvolume) return std::nullopt;
    const Descriptor opened(open(snapshot.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    btrfs_ioctl_get_subvol_info_args subvolume{};
    if (!opened || ioctl(opened.get(), BTRFS_IOC_GET_SUBVOL_INFO, &subvolume) < 0) return std::nullopt;
    return subvolume.otime.sec != 0 ? std::optional(static_cast<time_t>(subvolume.otime.sec)) : std::nullopt;
}

bool isName(const std::string& name) {
    return !name.empty() && name.size() <= NAME_MAX && name != "." && name != ".." &&
           name.find('/') == std::string::npos && name.find('\0') == std::string::npos;
}

Shelf shelfOf(const std::string& base, const std::string& format = "") {
    Shelf shelf;
    shelf.base = base;
    shelf.format = format;
    return shelf;
}

void addShelf(const Descriptor& above, const std::string& path, Shelf shelf, Shelves& shelves) {
    shelf.folder = openBeneath(above, path, LinkPolicy::kNone, O_RDONLY | O_DIRECTORY);
    if (shelf.folder) {
        shelves.all.push_back(std::move(shelf));
    } else if (errno == EACCES) {
        shelves.isClosed = true;
    }
}

bool isMountRoot(const Descriptor& folder) {
    struct statx status {};
    return statx(folder.get(), "", AT_EMPTY_PATH, 0, &status) != 0 ||
           (status.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
}

// Goes up from an open folder, as far as the file system, or a subvolume of it, goes.
class Ascent {
 public:
    Ascent(const Descriptor& folder, std::string path)
        : at_(openat(folder.get(), ".", O_PATH | O_DIRECTORY | O_CLOEXEC)), path_(std::move(path)) {
        if (at_) look();
    }
    explicit operator bool() const { return static_cast<bool>(at_); }
    [[nodiscard]] const Descriptor& at() const { return at_; }
    [[nodiscard]] const std::string& path() const { return path_; }
    // Snapshots of what lies above are without what lies here.
    [[nodiscard]] bool isTop() const { return top_; }
    // False when this was the top, or nothing could be opened above.
    bool up() {
        if (top_ || ++steps_ == kMostAbove || path_.empty()) return false;
        at_ = std::move(above_);
        path_.resize(path_.rfind('/'));
        if (path_.empty()) path_ = "/";
        look();
        return true;
    }

 private:
    void look() {
        struct stat here {
        }, over{};
        above_ = Descriptor(openat(at_.get(), "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
        top_ = !above_ || path_ == "/" || isMountRoot(at_) || fstat(at_.get(), &here) != 0 ||
               fstat(above_.get(), &over) != 0 || here.st_dev != over.st_dev;
    }

    Descriptor at_, above_;
    std::string path_;
    bool top_ = true;
    int steps_ = 0;
};

// Without a word of the share: what ZFS and snapper have, at the root of the file system or subvolume, or of the share.
int findUsual(const std::string& root, const Descriptor& folder, const std::string& path, Shelves& shelves) {
    Ascent ascent(folder, path);
    if (!ascent) return refusalCode(errno, path);
    do {
        if (!ascent.isTop() && ascent.path() != root) continue;
        Shelf zfs = shelfOf(ascent.path());
        zfs.takesUndated = true;
        addShelf(ascent.at(), kZfs, std::move(zfs), shelves);
        addShelf(ascent.at(), kSnapper, shelfOf(ascent.path()), shelves);
    } while (ascent.up());
    return ORV_ERR_NONE;
}

// As the share says.
int findStated(const VEXOSNAPSHOTS& stated, const std::string& root, const Descriptor& folder, const std::string& path,
               Shelves& shelves) {
    const std::string where = stated.folder, mount = stated.mount, inside = stated.inside;
    Shelf shelf = shelfOf("", stated.format);
    shelf.isLocalTime = (stated.flags & VEXO_SNAPSHOTS_LOCAL_TIME) != 0;
    if ((stated.flags & VEXO_SNAPSHOTS_EVERYWHERE) != 0 && !where.starts_with('/')) {
        Ascent ascent(folder, path);
        if (!ascent) return refusalCode(errno, path);
        do {
            Shelf one = shelfOf(ascent.path(), shelf.format);
            one.isLocalTime = shelf.isLocalTime;
            addShelf(ascent.at(), where, std::move(one), shelves);
        } while (ascent.up());
        return ORV_ERR_NONE;
    }
    const Descriptor top(open("/", O_PATH | O_DIRECTORY | O_CLOEXEC));
    Ascent ascent(Descriptor(open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)), root);
    if (!top || !ascent) return refusalCode(errno, root);
    while (ascent.path() != mount && ascent.up()) {
    }
    const std::string above = mount.empty() ? ascent.path() : mount;
    shelf.inside = inside;
    shelf.base = !inside.empty() ? root : *stated.base != '\0' ? std::string(stated.base) : above;
    const std::string absolute = where.starts_with('/') ? where : (above == "/" ? "" : above) + "/" + where;
    addShelf(top, absolute.substr(1), std::move(shelf), shelves);
    return ORV_ERR_NONE;
}

}  // namespace

std::optional<time_t> dateInName(std::string_view name) {
    for (size_t i = 0; i + 8 <= name.size(); ++i) {
        if (!isDigit(name[i]) || (i > 0 && isDigit(name[i - 1]))) continue;
        const auto fields = dateAt(name.substr(i));
        if (!fields) continue;
        const bool isUtc = name.find("GMT") != std::string_view::npos || name.find("UTC") != std::string_view::npos;
        return timeOf(*fields, !isUtc);
    }
    return std::nullopt;
}

std::optional<time_t> dateByFormat(const std::string& name, const std::string& format, bool isLocalTime) {
    std::tm fields{};
    fields.tm_mday = 1;
    const char* end = strptime(name.c_str(), format.c_str(), &fields);
    return end != nullptr && *end == '\0' ? timeOf(fields, isLocalTime) : std::nullopt;
}

int findShelves(const std::string& root, const Descriptor& folder, const std::string& path, Shelves& shelves) {
    const auto stated = std::make_unique<VEXOSNAPSHOTS>();
    if (VEXOShareSnapshots(root.c_str(), stated.get()) != 0) return platformCode();
    if ((stated->flags & VEXO_SNAPSHOTS_NONE) != 0) return ORV_ERR_NONE;
    return (stated->flags & VEXO_SNAPSHOTS_STATED) != 0 ? findStated(*stated, root, folder, path, shelves)
                                                        : findUsual(root, folder, path, shelves);
}

Descriptor openSnapshot(const Shelf& shelf, const std::string& name) {
    if (!isName(name)) {
        errno = ENOENT;
        return Descriptor();
    }
    constexpr int flags = O_PATH | O_DIRECTORY;
    if (shelf.format.empty() && isNumber(name)) {
        Descriptor inner = openBeneath(shelf.folder, name + "/snapshot", LinkPolicy::kNone, flags);
        if (inner || errno != ENOENT) return inner;
    }
    return openBeneath(shelf.folder, name, LinkPolicy::kNone, flags);
}

std::optional<Snapshot> snapshotOf(const Shelf& shelf, const std::string& name) {
    if (!isName(name)) return std::nullopt;
    if (!shelf.format.empty()) {
        const auto time = dateByFormat(name, shelf.format, shelf.isLocalTime);
        return time ? std::optional(Snapshot{name, *time, Dated::kByName}) : std::nullopt;
    }
    if (isNumber(name)) {
        if (const auto time = dateInRecord(shelf, name)) return Snapshot{name, *time, Dated::kByRecord};
    }
    if (const auto time = dateInName(name)) return Snapshot{name, *time, Dated::kByName};
    const Descriptor opened = openSnapshot(shelf, name);
    if (!opened) return std::nullopt;
    if (const auto time = dateInFileSystem(opened)) return Snapshot{name, *time, Dated::kByFileSystem};
    return shelf.takesUndated ? std::optional(Snapshot{name, 0, Dated::kNot}) : std::nullopt;
}

bool snapshotsIn(const Shelf& shelf, std::vector<Snapshot>& snapshots) {
    // A descriptor of its own: the shelf may be read more than once.
    const int folder = openat(shelf.folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    const std::unique_ptr<DIR, int (*)(DIR*)> names(folder >= 0 ? fdopendir(folder) : nullptr, closedir);
    if (names == nullptr) {
        if (folder >= 0) close(folder);
        return false;
    }
    errno = 0;
    while (const dirent* entry = readdir(names.get())) {
        const bool isFolder = entry->d_type == DT_DIR || entry->d_type == DT_UNKNOWN;
        if (snapshots.size() == kMostNames) return false;
        if (const auto found = isFolder ? snapshotOf(shelf, entry->d_name) : std::nullopt) snapshots.push_back(*found);
        errno = 0;
    }
    const bool whole = errno == 0;
    std::sort(snapshots.begin(), snapshots.end(), [](const Snapshot& a, const Snapshot& b) {
        return a.time != b.time ? a.time > b.time : a.name > b.name;
    });
    return whole;
}

// In a part of the path that a shelf can be: "NAME" behind "/.snapshots/".
static bool isUsualSnapshot(const std::string& path) {
    if (path.find(std::string("/") + kZfs + "/") != std::string::npos) return true;
    const std::string shelf = std::string("/") + kSnapper + "/";
    for (size_t at = path.find(shelf); at != std::string::npos; at = path.find(shelf, at + 1)) {
        const size_t begin = at + shelf.size();
        const std::string name = path.substr(begin, path.find('/', begin) - begin);
        struct stat above {
        }, inside{};
        if (isNumber(name) || dateInName(name)) return true;
        if (stat(path.substr(0, begin).c_str(), &above) == 0 &&
            stat((path.substr(0, begin) + name).c_str(), &inside) == 0 && above.st_dev != inside.st_dev) {
            return true;
        }
    }
    return false;
}

bool isInSnapshot(const Descriptor& folder, const std::string& name) {
    const std::string real = realPathOf(folder), path = real + "/" + name;
    const auto stated = std::make_unique<VEXOSNAPSHOTS>();
    const bool known = !real.empty() && VEXOShareSnapshots(real.c_str(), stated.get()) == 0;
    if (!known || (stated->flags & VEXO_SNAPSHOTS_STATED) == 0) return isUsualSnapshot(path);
    const std::string where = std::string(stated->folder) + "/";
    return where.starts_with('/') ? path.starts_with(where) : path.find("/" + where) != std::string::npos;
}

}  // namespace orvel::cgi
