#include "kept_listing.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <functional>
#include <list>
#include <unordered_map>

#include "confined.h"
#include "kept_store.h"
#include "natural_order.h"
#include "orvel/error_state.h"
#include "orvel/listing.h"
#include "orvel/mount_status.h"
#include "orvel/privilege.h"
#include "reply.h"
#include "vexo/filesystem.h"

namespace orvel::cgi {
namespace {

using Entries = std::vector<const DIRENTRY_INFO*>;

constexpr long long kTick = 20'000'000;  // nanoseconds, more than the kernel's clock of file times takes to step on

long long ageOf(int64_t seconds, int64_t nanoseconds) {
    timespec now{};
    clock_gettime(CLOCK_REALTIME_COARSE, &now);
    return (now.tv_sec - seconds) * 1'000'000'000LL + (now.tv_nsec - nanoseconds);
}

// Two changes within one step of the clock leave the same time: what is listed now must not be taken for what stands
// there after another one.
void awaitTick(const FolderState& state) {
    const long long age = ageOf(state.modified, state.modifiedNs);
    if (age < 0 || age >= kTick) return;
    const timespec rest = {.tv_sec = 0, .tv_nsec = kTick - age};
    nanosleep(&rest, nullptr);
}

// Keys of all names, in one text.
bool appendKeys(const Entries& entries, NaturalOrder& order, std::string& keys, std::vector<size_t>& ends) {
    const bool isShort = std::all_of(entries.begin(), entries.end(),
                                     [&](const DIRENTRY_INFO* entry) { return order.hasShortKey(entry->name); });
    for (const DIRENTRY_INFO* entry : entries) {
        if (isShort) {
            NaturalOrder::appendShortKey(entry->name, keys);
        } else if (!order.appendKey(entry->name, keys)) {
            return false;
        }
        ends.push_back(keys.size());
    }
    return true;
}

// False when the language's order cannot be had: then the library's stays.
bool sortNaturally(Entries& entries, const std::string& language, bool ascending) {
    NaturalOrder order(language);
    std::string keys;
    std::vector<size_t> ends;
    if (!appendKeys(entries, order, keys, ends)) return false;
    std::vector<size_t> positions(entries.size());
    for (size_t i = 0; i < positions.size(); ++i) positions[i] = i;
    const auto keyOf = [&](size_t at) {
        const size_t begin = at == 0 ? 0 : ends[at - 1];
        return std::string_view(keys).substr(begin, ends[at] - begin);
    };
    const auto before = [&](size_t a, size_t b) {
        if (entries[a]->isDirectory != entries[b]->isDirectory) return entries[a]->isDirectory;
        const int difference = keyOf(a).compare(keyOf(b));
        return difference != 0 ? difference < 0 : entries[a]->name < entries[b]->name;
    };
    std::sort(positions.begin(), positions.end(), before);
    if (!ascending) std::reverse(positions.begin(), positions.end());
    Entries sorted;
    sorted.reserve(entries.size());
    for (const size_t at : positions) sorted.push_back(entries[at]);
    entries.swap(sorted);
    return true;
}

Entries orderedAs(const std::list<DIRENTRY_INFO>& listed, const ListRequest& request, const KeptOrder& order) {
    Entries entries;
    entries.reserve(listed.size());
    for (const DIRENTRY_INFO& entry : listed) entries.push_back(&entry);
    if (!order.natural.empty() && (request.sortBy.empty() || request.sortBy == "name"))
        static_cast<void>(sortNaturally(entries, order.natural, request.ascending));
    if (order.foldersFirst)
        std::stable_partition(entries.begin(), entries.end(),
                              [](const DIRENTRY_INFO* one) { return one->isDirectory; });
    return entries;
}

// Puts the id or the refusal into `anew`.
void keep(const ListRequest& request, const OpenedFolder& opened, const Entries& entries, KeptAnew& anew) {
    KeptText text;
    for (const DIRENTRY_INFO* entry : entries) {
        text.add(entry->name, entry->isDirectory);
        if (text.size() > size_t{kMostKeptBytes}) break;
    }
    KeptResult kept = KeptResult::kFull;
    if (text.rows() == entries.size()) {
        const KeptAbout about = {opened.info.path, request.pattern, request.type, opened.state};
        const bool canTell = request.pattern.find('\0') == std::string::npos;
        kept = canTell ? keepBytes(request.user, text.finish(about), anew.id) : KeptResult::kFailed;
    }
    if (kept == KeptResult::kDone) return;
    anew.id.clear();
    anew.refusal = kept == KeptResult::kFull ? "full" : "failed";
}

// What may come out of a folder that is open, name by name.
class RowFiller {
 public:
    RowFiller(const ListRequest& request, const OpenedFolder& opened) : request_(request), opened_(opened) {}

    // 0 with the row, or a library code.
    int fill(const KeptRow& kept, KeptPageRow& row) {
        const std::string path = opened_.info.path + "/" + kept.name;
        const std::string real = opened_.realPath + "/" + kept.name;
        const bool withIcon = (request_.additional & kAdditionalIcon) != 0;
        const int additional = request_.additional & ~kAdditionalIcon & ~ADDITIONAL_REAL_PATH;
        row.entry = DIRENTRY_INFO();
        OrvLibSetErr(ORV_ERR_NONE);
        const int filled =
            enumeration_.FillFileInfo(path.c_str(), opened_.folder.path(kept.name).c_str(), kept.name.c_str(),
                                      DIR_ENTRY_TYPE_ALL, DT_UNKNOWN, additional, row.entry);
        row.gone = filled != 0 || row.entry.isDirectory != kept.isFolder;
        const int type = kept.isFolder ? mounts_.getFSTYPE(real.c_str()) : 0;
        const bool isRemote = kept.isFolder && VEXOFSIsRemoteFS(type) == 1;
        if (filled < 0 && !isRemote) return lastCode();
        if (row.gone) row.entry = DIRENTRY_INFO();
        row.entry.name = kept.name;
        row.entry.path = path;
        row.entry.isDirectory = kept.isFolder;
        if (withIcon || (request_.additional & ADDITIONAL_REAL_PATH) != 0) row.entry.realPath = real;
        if (row.gone && isRemote) {
            row.gone = false;
            row.entry.mountPointType = "remotefail";
        } else if (kept.isFolder && (additional & ADDITIONAL_MOUNT_POINT_TYPE) != 0) {
            row.entry.mountPointType = isRemote ? "remote" : VEXOFSIsImageFS(type) == 1 ? "iso" : "";
        }
        return ORV_ERR_NONE;
    }

 private:
    const ListRequest& request_;
    const OpenedFolder& opened_;
    OrvEnum enumeration_;
    OrvelMountStatus mounts_;  // by the path: what is open is asked for by another one
};

}  // namespace

int openListed(const ListRequest& request, OpenedFolder& opened) {
    const int code = openFolderToList(request, opened.info, opened.folder, opened.realPath);
    if (code != ORV_ERR_NONE) return code;
    return stateOf(opened.folder, opened.state) ? ORV_ERR_NONE : refusalCode(errno, opened.realPath);
}

int keepFolder(const ListRequest& request, const KeptOrder& order, KeptAnew& anew) {
    OpenedFolder opened;
    int code = openListed(request, opened);
    if (code != ORV_ERR_NONE) return code;
    awaitTick(opened.state);
    ListRequest all = request;
    all.offset = all.limit = 0;
    all.additional = 0;
    Listing whole;
    code = listOpened(all, opened.folder, opened.info.path, opened.realPath, whole);
    if (code != ORV_ERR_NONE) return code;
    const Entries entries = orderedAs(whole.entries, request, order);
    keep(request, opened, entries, anew);

    RowFiller filler(request, opened);
    anew.total = entries.size();
    const size_t first = std::min<size_t>(request.offset, entries.size());
    const size_t most = request.limit == 0 ? entries.size() : request.limit;
    const size_t end = first + std::min<size_t>(most, entries.size() - first);
    for (size_t i = first; i < end && code == ORV_ERR_NONE; ++i)
        code = filler.fill({entries[i]->name, entries[i]->isDirectory}, anew.rows.emplace_back());
    return code;
}

int KeptListing::find(const std::string& user, const std::string& id) {
    user_ = user;
    id_ = id;
    Descriptor opened = openKept(user, id);
    if (!opened) {
        why_ = "gone";
        return ORV_ERR_MISSING;
    }
    return file_.open(std::move(opened)) ? ORV_ERR_NONE : damaged();
}

int KeptListing::damaged() {
    why_ = "damaged";
    file_ = KeptFile();
    dropKept(user_, id_);
    return ORV_ERR_GENERAL;
}

int KeptListing::openFolder(const ListRequest& request, OpenedFolder& opened) {
    const int code = openListed(request, opened);
    if (code != ORV_ERR_NONE || opened.state.isSameFolder(file_.about().folder)) return code;
    why_ = "replaced";
    return ORV_ERR_MISSING;
}

int KeptListing::page(const ListRequest& request, const OpenedFolder& opened, std::vector<KeptPageRow>& rows) {
    RowFiller filler(request, opened);
    const auto first = static_cast<uint32_t>(std::min<unsigned long>(request.offset, file_.rows()));
    const unsigned long most = request.limit == 0 ? file_.rows() : request.limit;
    const auto end = static_cast<uint32_t>(first + std::min<unsigned long>(most, file_.rows() - first));
    int code = ORV_ERR_NONE;
    const bool whole = file_.each(first, end, [&](uint32_t /*number*/, const KeptRow& kept) {
        code = filler.fill(kept, rows.emplace_back());
        return code == ORV_ERR_NONE;
    });
    return whole ? code : damaged();
}

int KeptListing::stateOfRows(uint32_t first, uint32_t end, const OpenedFolder& opened, std::string& state) {
    std::vector<int64_t> facts;
    bool isSettled = true;
    const bool whole = file_.each(first, end, [&](uint32_t /*number*/, const KeptRow& kept) {
        struct statx now {};
        // Asked of no other machine: what it has told the kernel already has to do.
        const int flags = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT | AT_STATX_DONT_SYNC;
        if (statx(opened.folder.get(), kept.name.c_str(), flags, STATX_BASIC_STATS, &now) != 0) now = {};
        const statx_timestamp& modified = now.stx_mtime;
        const statx_timestamp& changed = now.stx_ctime;
        for (const uint64_t fact : {uint64_t{now.stx_dev_major}, uint64_t{now.stx_dev_minor}, uint64_t{now.stx_ino},
                                    uint64_t{now.stx_mode}, uint64_t{now.stx_uid}, uint64_t{now.stx_gid},
                                    uint64_t{now.stx_size}, uint64_t{modified.tv_nsec}, uint64_t{changed.tv_nsec}})
            facts.push_back(static_cast<int64_t>(fact));
        facts.insert(facts.end(), {modified.tv_sec, changed.tv_sec});
        const long long age = ageOf(changed.tv_sec, changed.tv_nsec);
        isSettled = isSettled && (age < 0 || age >= kTick);
        return true;
    });
    if (!whole) return damaged();
    const std::string_view bytes(reinterpret_cast<const char*>(facts.data()), facts.size() * sizeof facts[0]);
    state = isSettled ? std::to_string(std::hash<std::string_view>()(bytes)) : "";
    return ORV_ERR_NONE;
}

int KeptListing::findBeginning(const std::string& text, uint32_t from, std::optional<uint32_t>& row) {
    const NameBeginning beginning(text);
    const auto look = [&](uint32_t number, const KeptRow& kept) {
        if (beginning.begins(kept.name)) row = number;
        return !row;
    };
    const bool whole = file_.each(from, file_.rows(), look) && (row || file_.each(0, from, look));
    return whole ? static_cast<int>(ORV_ERR_NONE) : damaged();
}

int KeptListing::rowsOf(const std::vector<std::string>& names, std::vector<int64_t>& rows) {
    std::unordered_map<std::string, size_t> wanted;
    for (size_t i = 0; i < names.size(); ++i) wanted.emplace(names[i], i);
    rows.assign(names.size(), -1);
    size_t found = 0;
    const bool whole = file_.each(0, file_.rows(), [&](uint32_t number, const KeptRow& kept) {
        const auto at = wanted.find(kept.name);
        if (at == wanted.end() || rows[at->second] >= 0) return true;
        rows[at->second] = number;
        return ++found < wanted.size();
    });
    return whole ? static_cast<int>(ORV_ERR_NONE) : damaged();
}

}  // namespace orvel::cgi
