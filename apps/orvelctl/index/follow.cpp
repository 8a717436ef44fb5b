// The part of an indexer that follows single changes.
#include <sys/stat.h>

#include <climits>
#include <ctime>
#include <utility>

#include "index/indexer.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"

namespace orvel::ctl {
namespace {

// Names in a folder beyond which it is read as a whole.
constexpr size_t kManyNames = 256;

std::string within(const std::string& folder, const std::string& name) {
    return folder.empty() ? name : folder + "/" + name;
}

std::string nameOf(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

std::string parentOf(const std::string& path) {
    const size_t slash = path.rfind('/');
    return slash == std::string::npos ? "" : path.substr(0, slash);
}

// Whether the path or a folder above it is among `paths`.
bool isWithin(std::string path, const std::set<std::string>& paths) {
    for (;;) {
        if (paths.contains(path)) return true;
        const size_t slash = path.rfind('/');
        if (slash == std::string::npos) return false;
        path.resize(slash);
    }
}

}  // namespace

bool Indexer::isLeftOut(const std::string& folder, const std::string& name) const {
    const std::string path = files_.realPath(within(folder, name));
    return VEXOEAIsHiddenFile(name.c_str()) == 1 || path.size() >= PATH_MAX ||
           (folder.empty() && VEXOShareIsShareRecycle(path.c_str()) == 1);
}

// False when an error keeps from telling.
bool Indexer::look(const std::string& folder, const std::string& name, bool replaced, std::vector<Look>& looks) {
    Look one = {within(folder, name), std::nullopt, std::nullopt, replaced};
    Entry entry = {name, one.path, {}};
    if (isLeftOut(folder, name)) return true;
    const Presence presence = files_.status(one.path, entry.status);
    if (presence == Presence::kUnknown) return false;
    if (presence == Presence::kThere && !(entry.isFolder() && files_.isRemoteMount(one.path))) one.now = entry;
    one.before = rows_.at(one.path);
    looks.push_back(std::move(one));
    return true;
}

bool Indexer::lookAtAll(const std::string& folder, const std::map<std::string, bool>& names, std::vector<Look>& looks) {
    std::map<std::string, Row> rows = rows_.in(folder);
    std::vector<Entry> entries;
    if (!list(folder, entries)) return false;
    for (Entry& entry : entries) {
        const auto events = names.find(entry.name);
        const auto row = rows.find(entry.name);
        Look one = {entry.path, std::nullopt, std::nullopt, events != names.end() && events->second};
        if (row != rows.end()) {
            one.before = row->second;
            rows.erase(row);
        }
        one.now = std::move(entry);
        looks.push_back(std::move(one));
    }
    bool done = true;
    for (const auto& [name, row] : rows) done = look(folder, name, true, looks) && done;
    return done;
}

// A folder that the index does not have is read when it is added.
bool Indexer::lookAtOwn(const std::string& folder) {
    if (folder.empty()) return true;
    const std::optional<Row> row = rows_.at(folder);
    if (!row || !row->isFolder) return false;
    Entry own = {nameOf(folder), folder, {}};
    const int64_t seen = kernelClock();
    if (files_.status(folder, own.status) == Presence::kThere && own.isFolder()) compared_.emplace_back(own, seen);
    return true;
}

void Indexer::take(Look& look) {
    // What was seen in a folder that has come or gone since is not believed: it was read anew, or has events to come.
    if (isWithin(parentOf(look.path), renewed_)) return;
    const bool wasFolder = look.before && look.before->isFolder;
    if (!look.now || (wasFolder && look.now->isFolder() && look.replaced)) {
        if (look.before) removeTree(look.path, wasFolder);
        look.before.reset();
    }
    if (wasFolder && !(look.now && look.before && look.now->isFolder())) renewed_.insert(look.path);
    if (!look.now) return;
    if (wasFolder && look.before && look.now->isFolder()) {
        // What is new in it has events of its own.
        if (!(rows_.rowOf(*look.now) == *look.before)) compared_.emplace_back(*look.now, kernelClock());
        return;
    }
    if (look.now->isFolder()) renewed_.insert(look.path);
    compareEntry(*look.now, look.before ? &*look.before : nullptr);
}

// False when an error keeps from telling what became of one of the names.
bool Indexer::lookInto(const std::string& folder, const std::map<std::string, bool>& names, std::vector<Look>& looks) {
    if (names.size() > kManyNames) return lookAtAll(folder, names, looks);
    bool whole = true;
    for (const auto& [name, replaced] : names) {
        if (!name.empty()) whole = look(folder, name, replaced, looks) && whole;
    }
    return whole;
}

// With its old times the folder is compared by the next update.
void Indexer::forgetOwn(const std::string& folder) {
    std::erase_if(compared_, [&](const auto& own) { return own.first.path == folder; });
}

void Indexer::follow(const Touched& touched) {
    updating_ = true;
    std::vector<Look> looks;
    for (const auto& [folder, names] : touched) {
        if (stopped()) return;
        if (lookAtOwn(folder) && !lookInto(folder, names, looks)) forgetOwn(folder);
    }
    // What is gone first: it may stand elsewhere now.
    for (const bool gone : {true, false}) {
        for (Look& one : looks) {
            if (!stopped() && gone == !one.now) take(one);
        }
    }
    std::erase_if(compared_, [this](const auto& own) { return isWithin(own.first.path, renewed_); });
    renewed_.clear();
    writeOwnRows();
    postpone();
}

void Indexer::postpone() {
    for (const std::string& folder : std::exchange(unsettled_, {})) {
        quietFrom_[folder] = kernelClock() + kCoarsestTime + 1;
    }
}

void Indexer::settleQuiet(int64_t asOf) {
    for (auto next = quietFrom_.begin(); next != quietFrom_.end() && !stopped();) {
        const auto& [folder, from] = *next;
        Entry own = {nameOf(folder), folder, {}};
        if (from > asOf) {
            ++next;
            continue;
        }
        // One that has changed since is followed once more.
        if (files_.status(folder, own.status) == Presence::kThere && own.isFolder() &&
            own.status.st_change <= asOf - kCoarsestTime && rows_.at(folder)) {
            writeOwnRow(std::move(own), asOf);
        }
        next = quietFrom_.erase(next);
    }
    postpone();
}

}  // namespace orvel::ctl
