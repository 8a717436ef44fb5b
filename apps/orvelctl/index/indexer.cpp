#include "index/indexer.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "index/folder_state.h"

namespace orvel::ctl {
namespace {

constexpr int kSettlingRounds = 2;
constexpr useconds_t kNap = 50000;

std::string parentOf(const std::string& path) {
    const size_t slash = path.rfind('/');
    return slash == std::string::npos ? "" : path.substr(0, slash);
}

std::string within(const std::string& folder, const std::string& name) {
    return folder.empty() ? name : folder + "/" + name;
}

}  // namespace

void Indexer::noteUnread(const std::string& what) {
    if (counts_.unread++ == 0) unread_ = what;
}

// False when an update could not read it; a build must not pass for whole without it.
bool Indexer::list(const std::string& folder, std::vector<Entry>& entries) {
    try {
        entries = files_.list(folder);
    } catch (const Unreadable& error) {
        if (!updating_) throw;
        noteUnread(error.what());
        return false;
    }
    progress_.at("/" + folder, entries.size());
    return true;
}

void Indexer::add(const Entry& entry) {
    rows_.insert(entry);
    ++counts_.added;
}

// The new folder with its files added, its folders not yet.
Indexer::NewFolder Indexer::read(Entry folder) {
    NewFolder made = {std::move(folder), kernelClock(), {}, true};
    if (updating_) {
        Entry begun = made.own;
        --begun.status.st_change;
        rows_.insert(begun);
    }
    std::vector<Entry> entries;
    made.whole = list(made.own.path, entries);
    for (Entry& entry : entries) {
        if (entry.isFolder()) {
            made.inside.push_back(std::move(entry));
        } else {
            add(entry);
        }
    }
    return made;
}

// Each folder before what lies in it, as one that changed: where the work is broken off the next update finds the
// folder, compares it or, when it is gone by then, takes what was added out again. A build that is broken off is thrown
// away.
void Indexer::addTree(Entry top) {
    std::vector<NewFolder> way;
    way.push_back(read(std::move(top)));
    while (!way.empty() && !stopped()) {
        NewFolder& last = way.back();
        if (!last.inside.empty()) {
            Entry next = std::move(last.inside.back());
            last.inside.pop_back();
            way.push_back(read(std::move(next)));
            continue;
        }
        if (!last.own.path.empty() && last.whole) {
            writeOwnRow(std::move(last.own), last.seen);
            ++counts_.added;
        }
        way.pop_back();
    }
}

void Indexer::writeOwnRow(Entry folder, int64_t seen) {
    if (mayChangeUnseen(timesOf(folder.status), seen)) {
        unsettled_.insert(folder.path);
        --folder.status.st_change;
    }
    rows_.remove(folder.path);
    rows_.insert(folder);
}

// All at once: whatever is read between two changes makes the first one wait for the disk.
void Indexer::writeOwnRows() {
    for (auto& [folder, seen] : compared_) writeOwnRow(std::move(folder), seen);
    compared_.clear();
}

void Indexer::removeTree(const std::string& path, bool isFolder) {
    if (isFolder) {
        counts_.removed += rows_.removeBelow(path);
        const std::string prefix = path + "/";
        auto below = known_.lower_bound(prefix);
        while (below != known_.end() && below->first.starts_with(prefix)) below = known_.erase(below);
        known_.erase(path);
    }
    rows_.remove(path);
    ++counts_.removed;
}

// Folders that the index has come up on their own.
void Indexer::compareEntry(const Entry& entry, const Row* row) {
    if (row != nullptr && row->isFolder != entry.isFolder()) {
        removeTree(entry.path, row->isFolder);
        row = nullptr;
    }
    if (row == nullptr) {
        if (!entry.isFolder()) return add(entry);
        rows_.removeBelow(entry.path);  // what a work broken off has left
        return addTree(entry);
    }
    if (entry.isFolder() || rows_.rowOf(entry) == *row) return;
    rows_.remove(entry.path);
    rows_.insert(entry);
    ++counts_.changed;
}

// False when something in it could not be read, so that the folder's own row must not pass for compared.
bool Indexer::compare(const std::string& folder) {
    std::map<std::string, Row> rows = rows_.in(folder);
    std::vector<Entry> entries;
    if (!list(folder, entries)) return false;
    for (const Entry& entry : entries) {
        if (stopped()) return false;
        const auto row = rows.find(entry.name);
        compareEntry(entry, row != rows.end() ? &row->second : nullptr);
        if (row != rows.end()) rows.erase(row);
    }
    if (stopped()) return false;  // the listing may have been cut short
    for (const auto& [name, row] : rows) {
        const std::string path = within(folder, name);
        _tag_VEXOSTAT_ status;
        const bool gone = files_.isRemoteMount(path) || files_.status(path, status) == Presence::kGone;
        if (gone) removeTree(path, row.isFolder);
    }
    return true;
}

void Indexer::visit(const std::string& folder, const Row& stored, bool everything) {
    ++counts_.folders;
    if (files_.isRemoteMount(folder)) return removeTree(folder, true);
    const std::string parent = parentOf(folder);
    Entry own = {folder.substr(parent.empty() ? 0 : parent.size() + 1), folder, {}};
    const int64_t seen = kernelClock();
    const Presence presence = files_.status(folder, own.status);
    if (presence == Presence::kUnknown) noteUnread("/" + folder + " cannot be read: " + std::strerror(errno));
    // The folder above may be gone from the index, and then nothing else would find this one.
    if (presence == Presence::kGone) return removeTree(folder, true);
    if (presence != Presence::kThere || !own.isFolder()) return;

    const FolderState state = judgeFolder(stored.times, timesOf(own.status), changed_.contains(parent));
    if (state != FolderState::kSame) changed_.insert(folder);
    if (state == FolderState::kReplaced || replaced_.contains(parent)) replaced_.insert(folder);
    if (state == FolderState::kSame && !replaced_.contains(folder) && !everything) return;
    ++counts_.compared;
    if (!compare(folder)) return;
    const bool differs = !(rows_.rowOf(own) == stored);
    if (differs) ++counts_.changed;
    if (differs || mayChangeUnseen(timesOf(own.status), seen)) compared_.emplace_back(std::move(own), seen);
}

// Until a change could no longer fall into the second of an earlier one.
void Indexer::rest() {
    for (const int64_t start = kernelClock(); kernelClock() < start + kCoarsestTime && !stopped();) usleep(kNap);
}

// Compares once more the folders that changed so lately. One that goes on changing is left to the next update.
void Indexer::settle() {
    for (int round = 0; round < kSettlingRounds && !unsettled_.empty() && !stopped(); ++round) {
        rest();
        for (const std::string& folder : std::exchange(unsettled_, {})) {
            Entry own = {folder.substr(folder.rfind('/') + 1), folder, {}};
            const int64_t seen = kernelClock();
            if (stopped() || files_.status(folder, own.status) != Presence::kThere || !own.isFolder()) continue;
            // One of its name may have come after it was taken out.
            if (!rows_.at(folder)) continue;
            if (compare(folder)) compared_.emplace_back(std::move(own), seen);
        }
        writeOwnRows();
    }
}

bool Indexer::build() {
    addTree({});
    settle();
    return !stopped();
}

bool Indexer::update(bool everything) {
    updating_ = true;
    known_ = rows_.folders();
    // The root has no row that could show whether it changed.
    changed_.insert("");
    ++counts_.folders;
    ++counts_.compared;
    compare("");
    for (auto next = known_.begin(); next != known_.end() && !stopped();) {
        const auto [folder, stored] = *next;
        visit(folder, stored, everything);
        next = known_.upper_bound(folder);
    }
    writeOwnRows();
    settle();
    return !stopped();
}

}  // namespace orvel::ctl
