#include "shares/user_share_files.h"

#include <dirent.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <memory>
#include <set>
#include <utility>

#include "base/owner.h"
#include "base/raised_identity.h"
#include "filesystem/mount_table.h"
#include "shares/user_share.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kSambasFolder = "/var/lib/samba/usershares";
constexpr size_t kMaxNames = 10000;
constexpr size_t kMaxMounts = size_t{16} << 20;
using Folder = std::unique_ptr<DIR, orvel::Releaser<closedir>>;

bool isSameTime(const timespec& a, const timespec& b) {
    return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

// Names in their order, but those of files that are being written. False with errno.
bool readNames(int fd, std::set<std::string>& names) {
    Descriptor again = openFile(fd, ".", O_RDONLY | O_DIRECTORY);
    const Folder folder(again ? fdopendir(again.get()) : nullptr);
    if (!folder) return false;
    static_cast<void>(again.release());
    errno = 0;
    while (const dirent* entry = readdir(folder.get())) {
        const std::string name = entry->d_name;
        if (name == "." || name == ".." || name.starts_with(':') || names.size() == kMaxNames) continue;
        names.insert(name);
    }
    return errno == 0;
}

// By a table of mounts read for itself: the one that is kept holds a descriptor, and orveld's parent holds none.
bool isOnNetwork(const std::string& path) {
    const std::string own = VEXO::SystemPath("/proc/mounts");
    const Descriptor file = openFile(access(own.c_str(), F_OK) == 0 ? own : "/proc/self/mounts", O_RDONLY);
    std::string text;
    if (!file || !readAll(file.get(), text, kMaxMounts)) return true;
    const MountTable table = parseMountTable(text);
    const Mount* mount = mountHolding(table, path);
    return mount != nullptr && VEXOFSIsRemoteFS(mount->type) == 1;
}

DefinitionSection madeAfter(const Definitions& definitions, const UserShareRules& rules, bool& found) {
    DefinitionSection section;
    found = rules.likeShare.empty();
    if (found) {
        section.values = definitions.defaults;
        section.limits = definitions.global;
        return section;
    }
    const std::string like = foldedName(rules.likeShare);
    const auto made = std::find_if(definitions.sections.begin(), definitions.sections.end(),
                                   [&](const DefinitionSection& one) { return foldedName(one.name) == like; });
    found = made != definitions.sections.end();
    if (found) section = *made;
    return section;
}

}  // namespace

bool UserShareFiles::Look::isSameAs(const Look& other) const {
    const bool same = found == other.found && status.st_dev == other.status.st_dev &&
                      status.st_ino == other.status.st_ino && status.st_uid == other.status.st_uid &&
                      (status.st_mode & S_IFMT) == (other.status.st_mode & S_IFMT);
    return same && (!whole || (isSameTime(status.st_mtim, other.status.st_mtim) &&
                               isSameTime(status.st_ctim, other.status.st_ctim)));
}

UserShareFiles::Look UserShareFiles::lookAt(const std::string& path, bool whole) {
    Look look = {path, whole, false, {}};
    look.found = (whole ? lstat(path.c_str(), &look.status) : stat(path.c_str(), &look.status)) == 0;
    if (!look.found) look.status = {};
    return look;
}

bool UserShareFiles::isUnchanged() const {
    if (looks_.empty() || recent_.isRecent()) return true;
    if (!settled_) return false;
    const orvel::RaisedIdentity raised;
    const bool same = std::all_of(looks_.begin(), looks_.end(),
                                  [](const Look& look) { return look.isSameAs(lookAt(look.path, look.whole)); });
    if (same) recent_.note();
    return same;
}

bool UserShareFiles::isSameAs(const UserShareFiles& other) const {
    return std::equal(looks_.begin(), looks_.end(), other.looks_.begin(), other.looks_.end(),
                      [](const Look& a, const Look& b) { return a.path == b.path && a.isSameAs(b); });
}

void UserShareFiles::addTo(Definitions& definitions, bool isSambas) {
    UserShareRules rules = userShareRules(definitions.defaults, isSambas ? kSambasFolder : "");
    if (rules.folder.empty()) return;
    if (!rules.folder.starts_with('/')) rules.fault = "\"usershare path\" is not absolute";
    const size_t problems = definitions.problems.size();
    if (rules.fault.empty()) {
        const orvel::RaisedIdentity raised;
        readFolder(definitions, rules);
    } else {
        definitions.problems.push_back({rules.fault, rules.place});
    }
    for (size_t i = problems; i < definitions.problems.size(); ++i) {
        definitions.problems[i].text.insert(0, "shares of users: ");
    }
    timespec now{};
    clock_gettime(CLOCK_REALTIME_COARSE, &now);
    settled_ = std::all_of(looks_.begin(), looks_.end(), [&](const Look& look) {
        const timespec& time = look.status.st_ctim;
        return !look.whole || time.tv_sec < now.tv_sec || (time.tv_sec == now.tv_sec && time.tv_nsec < now.tv_nsec);
    });
}

// Users may write in the folder, so it has to keep them from each other's files.
void UserShareFiles::readFolder(Definitions& definitions, const UserShareRules& rules) {
    const auto refuse = [&](const std::string& why) {
        definitions.problems.push_back({rules.folder + why, rules.place});
    };
    const std::string path = VEXO::SystemPath(rules.folder);
    looks_.push_back(lookAt(path, true));
    const struct stat& status = looks_.front().status;
    if (!looks_.front().found) return rules.place.line == 0 ? void() : refuse(" is not there");
    const bool guarded = status.st_uid == 0 && (status.st_mode & (S_ISVTX | S_IWOTH)) == S_ISVTX;
    if (!S_ISDIR(status.st_mode) || !guarded) {
        return refuse(" has to be a folder of root's, with the sticky bit, in which not everybody may write");
    }
    bool found = false;
    const DefinitionSection made = madeAfter(definitions, rules, found);
    if (!found) return refuse(": \"usershare template share\" names no section");
    std::set<std::string> taken, names;
    for (const DefinitionSection& section : definitions.sections) taken.insert(foldedName(section.name));
    const Descriptor folder = openFile(path, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    if (!folder || !readNames(folder.get(), names)) return refuse(std::string(" cannot be read: ") + strerror(errno));
    unsigned count = 0;
    for (const std::string& name : names) {
        DefinitionSection section = made;
        section.place = section.faultPlace = {static_cast<int>(definitions.files.size()), 1};
        const std::string fault = readFile(folder.get(), name, rules, section);
        if (section.fault.empty()) section.fault = fault;
        if (!taken.insert(foldedName(section.name)).second) continue;  // as in Samba, the administrator's own
        if (section.fault.empty() && ++count > rules.most) {
            return refuse(" holds more shares than \"usershare max shares\" admits, " + std::to_string(rules.most));
        }
        definitions.files.push_back(rules.folder + "/" + name);
        definitions.sections.push_back(std::move(section));
    }
}

// The fault, or "".
std::string UserShareFiles::readFile(int folder, const std::string& name, const UserShareRules& rules,
                                     DefinitionSection& section) {
    section.name = name;
    section.user = UserShareTerms{};
    looks_.push_back(lookAt(VEXO::SystemPath(rules.folder) + "/" + name, true));
    const Descriptor file = openFile(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    if (!file || fstat(file.get(), &status) != 0) return std::string("its file cannot be read: ") + strerror(errno);
    if (!S_ISREG(status.st_mode)) return "its file is not a regular one";
    if ((status.st_mode & S_IWOTH) != 0) return "everybody can write to its file";
    std::string text;
    if (!readAll(file.get(), text, kMaxUserShareFile)) {
        return errno == EFBIG ? "its file is larger than 10 KiB" : std::string(strerror(errno));
    }
    UserShare share = readUserShare(name, text, rules);
    if (!share.fault.empty()) return share.fault;
    section.name = share.name;
    section.user = UserShareTerms{status.st_uid, std::move(share.entries)};
    const auto state = [&](ShareOption option, const std::string& value) {
        section.values[static_cast<size_t>(option)] = {value, true, true, section.place};
    };
    state(ShareOption::path, share.path);
    state(ShareOption::readOnly, "no");
    section.values[static_cast<size_t>(ShareOption::valid)] = {};
    return judgeTarget(share.path, status.st_uid, rules.ownerOnly);
}

std::string UserShareFiles::judgeTarget(const std::string& path, uid_t owner, bool ownerOnly) {
    // The server of a network mount may be dead, and would keep everybody waiting.
    if (isOnNetwork(path)) return "its folder lies on a network mount";
    looks_.push_back(lookAt(path, false));
    const Look& look = looks_.back();
    if (!look.found || !S_ISDIR(look.status.st_mode)) return "its folder " + path + " is not there";
    const bool may = owner == 0 || !ownerOnly || look.status.st_uid == owner;
    return may ? "" : "its folder " + path + " belongs to another user";
}

}  // namespace vexo
