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
#include "settings/appliance_setting.h"
#include "shares/user_share_files.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kSource = "share_store";
constexpr const char* kDefinitions = "/etc/vexo/shares.conf";
constexpr const char* kSambas = "/etc/samba/smb.conf";
constexpr size_t kMaxFile = size_t{1} << 20;
constexpr const char* kRecycle = "#recycle";

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
    UserShareFiles users;
    bool provisional = false;  // made from a text that somebody may still be writing

    [[nodiscard]] bool isCurrent(const std::string& path) const {
        return table != nullptr && !provisional && origins.front().path == path &&
               std::all_of(origins.begin(), origins.end(), [](const Origin& origin) { return origin.isUnchanged(); }) &&
               users.isUnchanged();
    }
    // True when both were made from files in the same state, read again only because a file was quite new.
    [[nodiscard]] bool isSameAs(const Store& other) const {
        return users.isSameAs(other.users) &&
               std::equal(origins.begin(), origins.end(), other.origins.begin(), other.origins.end(),
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
    Definitions parse(const std::string& path, const std::string& text);
};

// A relative name lies beside the main file.
std::string pathOfIncluded(const std::string& file, const std::string& main) {
    if (file.starts_with('/')) return VEXO::SystemPath(file);
    return main.substr(0, main.rfind('/') + 1) + file;
}

bool endsWithinLine(const std::string& text) {
    return !text.empty() && text.back() != '\n';
}

// Whether the file may be one that somebody is still writing.
bool isFresh(const Stamp& stamp) {
    constexpr time_t kQuiet = 2;  // seconds
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    return stamp.seconds + kQuiet >= now.tv_sec && stamp.seconds <= now.tv_sec + kQuiet;
}

// All that the file at `path`, whose text this is, leads to.
Definitions Store::parse(const std::string& path, const std::string& text) {
    provisional = endsWithinLine(text) && isFresh(origins.front().stamp);
    Definitions definitions = parseDefinitions(
        text, [&](const std::string& file) { return read(pathOfIncluded(file, path)); }, provisional);
    users.addTo(definitions, path == VEXO::SystemPath(kSambas));
    return definitions;
}

struct Reading {
    std::vector<ShareDefinition> shares;
    std::optional<ShareDefinition> homes;
    std::vector<std::string> faults;  // a line for the log each
};

std::string faultLine(const Definitions& definitions, const DefinitionSection& section, const ShareReading& reading) {
    const std::string name = "share [" + section.name + "] is ";
    if (!reading.fault.empty()) {
        const bool inLine = !section.fault.empty();
        return name + "left out: " + (inLine ? placeText(definitions, section.faultPlace) + ": " : "") + reading.fault;
    }
    const Closing& closing = reading.closings.front();
    return name + "closed: " + placeText(definitions, closing.place) + ": " + closing.option + " = " + closing.text +
           ": " + closing.why;
}

// A malformed section never hides the others.
Reading readShares(const Definitions& definitions) {
    Reading result;
    for (const Problem& problem : definitions.problems) {
        result.faults.push_back("share definitions: " + placeText(definitions, problem.place) + ": " + problem.text);
    }
    for (const DefinitionSection& section : definitions.sections) {
        ShareReading reading = readShare(section, definitions.global);
        if (!reading.share) {
            if (reading.off.empty()) result.faults.push_back(faultLine(definitions, section, reading));
        } else if (reading.isHomes) {
            result.homes = std::move(*reading.share);
        } else {
            result.shares.push_back(std::move(*reading.share));
        }
    }
    return result;
}

// Nothing, with errno, when the settings cannot be read: the shares of another file must not be served.
std::optional<std::string> definitionsPath() {
    const auto file = readSetting("share_definitions", kDefinitions);
    return file ? std::optional(VEXO::SystemPath(*file)) : std::nullopt;
}

PathVariables variablesOf(const Account& account, const std::string& share) {
    PathVariables variables;
    const AccountName name = splitAccountName(account.name);
    variables.share = share;
    variables.user = account.name;
    variables.name = name.name;
    variables.domain = name.domain;
    variables.home = account.home;
    Group group;
    if (AccountSource::instance().group(account.gid, group) == Lookup::found) variables.group = group.name;
    return variables;
}

PathVariables variablesFor(const std::string& share) {
    Account account;
    if (requestAccount(account) == Lookup::found) return variablesOf(account, share);
    PathVariables variables;
    variables.share = share;
    return variables;
}

std::optional<std::string> rootWith(const ShareDefinition& share, const PathVariables& variables) {
    const std::optional<std::string> path = replaceVariables(share.path, variables);
    return path ? normalRoot(*path) : std::nullopt;
}

}  // namespace

ShareTable::ShareTable(std::vector<ShareDefinition> shares, std::optional<ShareDefinition> homes)
    : shares_(std::move(shares)), homes_(std::move(homes)) {
    for (size_t i = 0; i < shares_.size(); ++i) {
        byName_.emplace(foldedName(shares_[i].name), i);
        if (hasVariables(shares_[i].path)) {
            withVariables_.push_back(i);
        } else {
            byRoot_.emplace(shares_[i].path, i);
        }
        vetoes_ = vetoes_ || !shares_[i].veto.empty();
        recycles_ = recycles_ || !shares_[i].recycle.empty();
    }
    vetoes_ = vetoes_ || (homes_ && !homes_->veto.empty());
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

std::vector<const ShareDefinition*> ShareTable::holding(const std::string& path) const {
    std::vector<std::pair<std::string, const ShareDefinition*>> found;
    for (size_t end = path.size(); end != 0 && end != std::string::npos; end = path.rfind('/', end - 1)) {
        const std::string root = path.substr(0, end);
        std::vector<size_t> same;
        for (auto [at, last] = byRoot_.equal_range(root); at != last; ++at) same.push_back(at->second);
        std::sort(same.begin(), same.end());
        for (const size_t i : same) found.emplace_back(root, &shares_[i]);
    }
    const auto add = [&](const ShareDefinition& share, const std::optional<std::string>& root) {
        if (root && path.starts_with(*root) && (path.size() == root->size() || path[root->size()] == '/')) {
            found.emplace_back(*root, &share);
        }
    };
    for (const size_t i : withVariables_) add(shares_[i], rootOf(shares_[i]));
    Account account;
    if (homes_ && requestAccount(account) == Lookup::found) add(*homes_, homeIn(*homes_, account));
    std::stable_sort(found.begin(), found.end(),
                     [](const auto& a, const auto& b) { return a.first.size() > b.first.size(); });
    std::vector<const ShareDefinition*> shares;
    shares.reserve(found.size());
    for (const auto& [root, share] : found) shares.push_back(share);
    return shares;
}

std::string ShareTable::recycleIn(const std::string& root) const {
    const std::vector<const ShareDefinition*> shares = holding(root);
    if (shares.empty() || shares.front()->recycle.empty()) return kRecycle;
    const auto path = replaceVariables(shares.front()->recycle, variablesFor(shares.front()->name));
    return path.value_or(kRecycle);
}

bool ShareTable::isRecycle(const std::string& path) const {
    const size_t slash = path.rfind('/');
    // A walk asks this for every entry: nearly all of them are decided by their name alone.
    if (slash == std::string::npos || (!recycles_ && path.compare(slash + 1, std::string::npos, kRecycle) != 0)) {
        return false;
    }
    const std::string root = path.substr(0, slash);
    if (!isRoot(root)) return false;
    const std::string bin = recycleIn(root);
    return bin.compare(0, bin.find('/'), path, slash + 1, std::string::npos) == 0;
}

Lookup requestAccount(Account& account) {
    const char* remote = secure_getenv("REMOTE_USER");
    AccountSource& accounts = AccountSource::instance();
    const bool named = remote != nullptr && *remote != '\0';
    return named ? accounts.user(remote, account) : accounts.user(geteuid(), account);
}

std::shared_ptr<const ShareTable> currentShares() {
    static Store& store = *new Store;  // still asked at exit
    const std::optional<std::string> found = definitionsPath();
    if (!found) return nullptr;
    const std::string& path = *found;
    {
        const KeepErrno keep;
        if (store.isCurrent(path)) return store.table;
    }
    Store fresh;
    const std::optional<std::string> text = fresh.read(path);
    if (!text) return nullptr;
    const KeepErrno keep;
    Reading reading = readShares(fresh.parse(path, *text));
    if (!fresh.isSameAs(store)) {
        for (const std::string& fault : reading.faults) {
            syslog(LOG_ERR, "%s:%d %s", kSource, __LINE__, orvel::printable(fault).c_str());
        }
    }
    fresh.table = std::make_shared<const ShareTable>(std::move(reading.shares), std::move(reading.homes));
    store = std::move(fresh);
    return store.table;
}

std::optional<std::string> rootOf(const ShareDefinition& share) {
    if (!hasVariables(share.path)) return share.path;
    return rootWith(share, variablesFor(share.name));
}

std::optional<std::string> rootFor(const ShareDefinition& share, const Account& account) {
    return rootWith(share, variablesOf(account, share.name));
}

std::optional<std::string> homeIn(const ShareDefinition& homes, const Account& account) {
    return rootWith(homes, variablesOf(account, splitAccountName(account.name).name));
}

DefinitionsReport reportDefinitions() {
    DefinitionsReport report;
    const std::optional<std::string> found = definitionsPath();
    if (!found) {
        report.error = errno;
        report.paths.push_back(VEXO::SystemPath("/etc/vexoinfo.conf"));
        return report;
    }
    const std::string& path = *found;
    report.paths.push_back(path);
    Store fresh;
    const std::optional<std::string> text = fresh.read(path);
    if (!text) {
        report.error = errno;
        return report;
    }
    report.definitions = fresh.parse(path, *text);
    for (size_t i = 1; i < report.definitions.files.size(); ++i) {
        report.paths.push_back(pathOfIncluded(report.definitions.files[i], path));
    }
    for (const DefinitionSection& section : report.definitions.sections) {
        report.readings.push_back(readShare(section, report.definitions.global));
    }
    return report;
}

}  // namespace vexo
