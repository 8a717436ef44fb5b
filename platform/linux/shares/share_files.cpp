#include "vexo/share_files.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "accounts/account_source.h"
#include "base/file.h"
#include "base/raised_identity.h"
#include "base/wildcard.h"
#include "failure.h"
#include "fault_gate.h"
#include "filesystem/file_permissions.h"
#include "filesystem/owner.h"
#include "shares/share_store.h"
#include "vexo/filesystem.h"

namespace vexo {
namespace {

constexpr mode_t kFileMask = 0744;
constexpr mode_t kFolderMask = 0755;
constexpr mode_t kBits = 0777;
constexpr mode_t kReadWrite = 0666;

std::string pathOf(int fd) {
    char path[PATH_MAX];
    const ssize_t size = readlink(("/proc/self/fd/" + std::to_string(fd)).c_str(), path, sizeof path);
    return size > 0 && size < ssize_t{sizeof path} ? std::string(path, static_cast<size_t>(size)) : std::string();
}

// A bin that is hidden in this process: where it lies, free of links, and what it is called.
struct HiddenBin {
    std::string folder;
    std::string name;
};

HiddenBin& hiddenBin() {
    static auto& value = *new HiddenBin;
    return value;
}

// A snapshot, and the folder that it is of.
struct StandIn {
    std::string folder, realPath;
};

StandIn& standIn() {
    static auto& value = *new StandIn;
    return value;
}

std::string meantBy(const std::string& folder) {
    const StandIn& stand = standIn();
    const bool lies = !stand.folder.empty() && folder.starts_with(stand.folder) &&
                      (folder.size() == stand.folder.size() || folder[stand.folder.size()] == '/');
    return lies ? stand.realPath + folder.substr(stand.folder.size()) : folder;
}

bool put(const std::string& text, char* out, size_t size) {
    if (text.size() >= size) return false;
    out[text.copy(out, text.size())] = '\0';
    return true;
}

// What the names that are asked about are compared with.
struct Veto {
    std::shared_ptr<const ShareTable> table;  // that it was made from
    std::string folder;
    std::vector<std::string> texts;
    std::vector<orvel::Wildcard> patterns;
};

Veto& veto() {
    static auto& value = *new Veto;
    return value;
}

void lookAt(const std::string& asked, std::shared_ptr<const ShareTable> table) {
    Veto& now = veto();
    const std::string folder = meantBy(asked);
    if (now.table == table && now.folder == folder) return;
    std::vector<std::string> texts;
    for (const ShareDefinition* share : table->holding(folder)) {
        texts.insert(texts.end(), share->veto.begin(), share->veto.end());
    }
    if (texts != now.texts) {
        now.patterns.clear();
        for (const std::string& text : texts) now.patterns.emplace_back(text, -1);
    }
    now.table = std::move(table);
    now.folder = folder;
    now.texts = std::move(texts);
}

// Null where nothing is kept out. While the definitions cannot be read, those last known count.
std::shared_ptr<const ShareTable> vetoingShares() {
    const KeepErrno keep;
    const int code = VLIBCErrGet();
    auto table = currentShares();
    if (table == nullptr) {
        VLIBCErrSetEx(code, __FILE__, __LINE__);
        return veto().table;
    }
    const bool vetoes = table->vetoes() || !hiddenBin().name.empty();
    if (!vetoes && !veto().patterns.empty()) veto() = {};
    return vetoes ? table : nullptr;
}

// `acl`: what the folder's default ACL grants, where it counts.
mode_t modeFor(const NewFiles& rules, const struct stat& folder, bool isFolder, mode_t wanted, bool own,
               std::optional<mode_t> acl) {
    if (rules.inheritPermissions) return folder.st_mode & (isFolder ? mode_t{03777} : kReadWrite);
    const std::optional<unsigned>& mask = isFolder ? rules.directoryMask : rules.createMask;
    const mode_t most = mask ? *mask : own ? mode_t{kBits} : isFolder ? kFolderMask : kFileMask;
    if (acl && rules.inheritAcls) return *acl & most;
    if (acl) return *acl & ((wanted & most) | (isFolder ? rules.forceDirectoryMode : rules.forceCreateMode));
    return (wanted & most) | (isFolder ? rules.forceDirectoryMode : rules.forceCreateMode);
}

bool isMember(const std::string& group) {
    Account account;
    std::vector<gid_t> groups;
    Group found;
    AccountSource& accounts = AccountSource::instance();
    return accounts.group(group, found) == Lookup::found && requestAccount(account) == Lookup::found &&
           accounts.groupsOf(account.name, account.gid, groups) &&
           std::find(groups.begin(), groups.end(), found.gid) != groups.end();
}

// The group that everything new in the share gets; nothing for none.
std::optional<gid_t> forcedGroup(const std::string& text) {
    const bool membersAlone = text.starts_with('+');
    const std::string name = text.substr(membersAlone ? 1 : 0);
    Group group;
    if (name.empty() || AccountSource::instance().group(name, group) != Lookup::found) return std::nullopt;
    return membersAlone && !isMember(name) ? std::nullopt : std::optional(group.gid);
}

struct Wanted {
    uid_t uid;
    gid_t gid;
    mode_t mode;
};

// By whoever may: first the user, then root, for what this process made for the user.
bool give(int made, const struct stat& status, const Wanted& wanted, bool modeStays) {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    const uid_t uid = wanted.uid == status.st_uid ? keep : wanted.uid;
    const gid_t gid = wanted.gid == status.st_gid ? keep : wanted.gid;
    const auto applied = [&] {
        struct stat now {};
        if (!setOwner(made, uid, gid)) return false;
        if (modeStays || (fstat(made, &now) == 0 && (now.st_mode & 07777) == wanted.mode)) return true;
        if (!setMode(made, wanted.mode) || fstat(made, &now) != 0) return false;
        // The kernel leaves out a set-group bit that the user may not give.
        errno = EPERM;
        return (wanted.mode & S_ISGID) == 0 || (now.st_mode & S_ISGID) != 0;
    };
    if (applied()) return true;
    if (errno != EPERM || status.st_uid != geteuid()) return false;
    const orvel::RaisedIdentity raised;
    return applied();
}

}  // namespace

bool giveNew(int folder, int made, mode_t mode, bool own, uid_t uid, gid_t gid) {
    struct stat above {};
    struct stat status {};
    if (fstat(folder, &above) != 0 || fstat(made, &status) != 0) return false;
    const bool isFolder = S_ISDIR(status.st_mode);
    const auto table = currentShares();
    const auto shares = table == nullptr ? std::vector<const ShareDefinition*>() : table->holding(pathOf(folder));
    static const NewFiles& none = *new NewFiles;
    const NewFiles& rules = shares.empty() ? none : shares.front()->newFiles;
    // A mode of its own counts for itself; outside every share nothing limits a default ACL.
    const auto acl = own ? std::nullopt : defaultAclMode(folder);
    const bool modeStays = acl && shares.empty();
    Wanted wanted = {uid, gid, modeFor(rules, above, isFolder, mode, own, acl)};
    if ((above.st_mode & S_ISGID) != 0) {
        wanted.gid = above.st_gid;
        if (isFolder) wanted.mode |= S_ISGID;
    } else if (const auto group = forcedGroup(rules.group)) {
        wanted.gid = *group;
    }
    return give(made, status, wanted, modeStays);
}

bool isVetoed(const char* name) {
    const HiddenBin& bin = hiddenBin();
    const bool isBin = !bin.name.empty() && bin.name == name && bin.folder == veto().folder;
    const std::vector<orvel::Wildcard>& patterns = veto().patterns;
    return isBin ||
           std::any_of(patterns.begin(), patterns.end(), [name](const auto& pattern) { return pattern.match(name); });
}

}  // namespace vexo

void VEXOShareNamesAt(const char* realPath) try {
    auto table = vexo::vetoingShares();
    if (table != nullptr && realPath != nullptr) vexo::lookAt(realPath, std::move(table));
} catch (const std::exception&) {
    abort();  // memory is out: what is to be hidden must not show
}

void VEXOShareNamesOf(int folder) try {
    auto table = vexo::vetoingShares();
    if (table == nullptr) return;
    const vexo::KeepErrno keep;
    vexo::lookAt(vexo::pathOf(folder), std::move(table));
} catch (const std::exception&) {
    abort();
}

int VEXOShareHideBin(const char* root) try {
    VEXO_GATE("VEXOShareHideBin", -1);
    if (root == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    auto table = vexo::currentShares();
    if (table == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    const orvel::Descriptor opened = orvel::openFile(root, O_PATH | O_DIRECTORY);
    if (!opened) return vexo::fail(vexo::errorOfErrno(errno));
    const std::string bin = table->recycleIn(root);
    vexo::hiddenBin() = {vexo::pathOf(opened.get()), bin.substr(0, bin.find('/'))};
    vexo::lookAt(vexo::hiddenBin().folder, std::move(table));  // known, should the definitions be unreadable later
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOShareVetoes(const char* name) {
    return name != nullptr && vexo::isVetoed(name) ? 1 : 0;
}

int VEXOShareGiveNew(int folder, int made, mode_t mode, unsigned switches, uid_t uid, gid_t gid) try {
    VEXO_GATE("VEXOShareGiveNew", -1);
    const bool own = (switches & VEXO_NEW_OWN_MODE) != 0;
    return vexo::giveNew(folder, made, mode, own, uid, gid) ? 0 : vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOShareRecyclePath(const char* root, char* path, int size) try {
    VEXO_GATE("VEXOShareRecyclePath", -1);
    if (root == nullptr || path == nullptr || size <= 0) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const auto table = vexo::currentShares();
    if (table == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    const std::string bin = table->recycleIn(root);
    if (bin.size() >= static_cast<size_t>(size)) return vexo::fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
    path[bin.copy(path, bin.size())] = '\0';
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOShareSnapshots(const char* root, PVEXOSNAPSHOTS out) try {
    VEXO_GATE("VEXOShareSnapshots", -1);
    if (root == nullptr || out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const auto table = vexo::currentShares();
    if (table == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    const std::vector<const vexo::ShareDefinition*> shares = table->holding(root);
    const vexo::Snapshots found = shares.empty() ? vexo::Snapshots() : shares.front()->snapshots;
    out->flags = 0;
    if (found.stated) out->flags |= VEXO_SNAPSHOTS_STATED;
    if (!found.known) out->flags |= VEXO_SNAPSHOTS_NONE;
    if (found.isLocalTime) out->flags |= VEXO_SNAPSHOTS_LOCAL_TIME;
    if (found.isEverywhere) out->flags |= VEXO_SNAPSHOTS_EVERYWHERE;
    const bool fits = vexo::put(found.folder, out->folder, sizeof out->folder) &&
                      vexo::put(found.format, out->format, sizeof out->format) &&
                      vexo::put(found.base, out->base, sizeof out->base) &&
                      vexo::put(found.mount, out->mount, sizeof out->mount) &&
                      vexo::put(found.inside, out->inside, sizeof out->inside);
    return fits ? 0 : vexo::fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOShareStandsFor(const char* folder, const char* realPath) try {
    if (folder != nullptr && realPath != nullptr) vexo::standIn() = {folder, realPath};
} catch (const std::exception&) {
    abort();  // memory is out: what is to be hidden must not show
}
