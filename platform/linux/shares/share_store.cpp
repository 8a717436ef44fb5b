#include "shares/share_store.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <utility>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "base/printable.h"
#include "failure.h"
#include "io/file_io.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kSource = "share_store";
constexpr const char* kDefinitions = "/etc/vexo/shares.conf";
constexpr size_t kMaxFile = size_t{1} << 20;

// What distinguishes one state of a file from another.
struct Stamp {
    bool exists = false;
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    time_t seconds = 0;
    long nanoseconds = 0;
    bool operator==(const Stamp&) const = default;
};

Stamp stampOf(const struct stat& status) {
    return {true, status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec, status.st_mtim.tv_nsec};
}

// One file that a table was made from.
struct Origin {
    std::string path;
    bool read;  // else it was missing or unreadable
    FileVersion version;
    Stamp stamp;

    [[nodiscard]] bool isUnchanged() const {
        if (read) return version.isCurrentAt(path);
        struct stat status {};
        const bool exists = stat(path.c_str(), &status) == 0;
        return stamp == (exists ? stampOf(status) : Stamp());
    }
};

struct Store {
    std::vector<Origin> origins;  // the main file first
    std::shared_ptr<const ShareTable> table;

    [[nodiscard]] bool isCurrent(const std::string& path) const {
        return table != nullptr && origins.front().path == path &&
               std::all_of(origins.begin(), origins.end(), [](const Origin& origin) { return origin.isUnchanged(); });
    }
    // True when both were made from files in the same state, read again only because a file was quite new.
    [[nodiscard]] bool isSameAs(const Store& other) const {
        return std::equal(origins.begin(), origins.end(), other.origins.begin(), other.origins.end(),
                          [](const Origin& a, const Origin& b) { return a.path == b.path && a.stamp == b.stamp; });
    }
    std::optional<std::string> read(const std::string& path) {
        struct stat status {};
        Origin origin{path, false, {}, stat(path.c_str(), &status) == 0 ? stampOf(status) : Stamp()};
        std::string text;
        origin.read = readRegularFile(path, kMaxFile, text, origin.version);
        origins.push_back(origin);
        return origin.read ? std::optional(std::move(text)) : std::nullopt;
    }
};

// A relative name lies beside the main file.
std::string pathOfIncluded(const std::string& file, const std::string& main) {
    if (file.starts_with('/')) return VEXO::SystemPath(file);
    return main.substr(0, main.rfind('/') + 1) + file;
}

struct Reading {
    std::vector<ShareDefinition> shares;
    std::vector<std::string> faults;  // a line for the log each
};

// A malformed section never hides the others.
Reading readShares(const Definitions& definitions) {
    Reading result;
    for (const std::string& problem : definitions.problems) result.faults.push_back("share definitions: " + problem);
    for (const DefinitionSection& section : definitions.sections) {
        ShareReading reading = readShare(section);
        if (reading.share) {
            result.shares.push_back(std::move(*reading.share));
        } else if (!reading.fault.empty()) {
            result.faults.push_back("share [" + section.name + "] is left out: " + reading.fault);
        }
    }
    return result;
}

PathVariables variablesFor(const std::string& share) {
    PathVariables variables;
    variables.share = share;
    const char* remote = secure_getenv("REMOTE_USER");
    AccountSource& accounts = AccountSource::instance();
    Account account;
    const bool named = remote != nullptr && *remote != '\0';
    const Lookup found = named ? accounts.user(remote, account) : accounts.user(geteuid(), account);
    if (found != Lookup::found) return variables;
    const AccountName name = splitAccountName(account.name);
    variables.user = account.name;
    variables.name = name.name;
    variables.domain = name.domain;
    Group group;
    if (accounts.group(account.gid, group) == Lookup::found) variables.group = group.name;
    return variables;
}

}  // namespace

ShareTable::ShareTable(std::vector<ShareDefinition> shares) : shares_(std::move(shares)) {
    for (size_t i = 0; i < shares_.size(); ++i) {
        byName_.emplace(foldedName(shares_[i].name), i);
        if (hasVariables(shares_[i].path)) {
            withVariables_.push_back(i);
        } else {
            byRoot_.emplace(shares_[i].path, i);
        }
    }
}

const ShareDefinition* ShareTable::find(std::string_view name) const {
    const auto found = byName_.find(foldedName(name));
    return found == byName_.end() ? nullptr : &shares_[found->second];
}

bool ShareTable::isRoot(const std::string& path) const {
    if (byRoot_.contains(path)) return true;
    for (const size_t i : withVariables_) {
        if (rootOf(shares_[i]) == path) return true;
    }
    return false;
}

std::shared_ptr<const ShareTable> currentShares() {
    static Store& store = *new Store;  // still asked at exit
    const std::string path = VEXO::SystemPath(VexoConf::Info().Get("share_definitions", kDefinitions));
    {
        const KeepErrno keep;
        if (store.isCurrent(path)) return store.table;
    }
    Store fresh;
    const std::optional<std::string> text = fresh.read(path);
    if (!text) return nullptr;
    const KeepErrno keep;
    Reading reading = readShares(
        parseDefinitions(*text, [&](const std::string& file) { return fresh.read(pathOfIncluded(file, path)); }));
    if (!fresh.isSameAs(store)) {
        for (const std::string& fault : reading.faults) {
            syslog(LOG_ERR, "%s:%d %s", kSource, __LINE__, orvel::printable(fault).c_str());
        }
    }
    fresh.table = std::make_shared<const ShareTable>(std::move(reading.shares));
    store = std::move(fresh);
    return store.table;
}

std::optional<std::string> rootOf(const ShareDefinition& share) {
    if (!hasVariables(share.path)) return share.path;
    std::optional<std::string> root = normalRoot(replaceVariables(share.path, variablesFor(share.name)));
    // Where a variable is empty the folder above would be everybody's.
    if (root && std::count(root->begin(), root->end(), '/') != std::count(share.path.begin(), share.path.end(), '/')) {
        return std::nullopt;
    }
    return root;
}

}  // namespace vexo
