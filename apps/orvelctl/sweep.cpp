// orvelctl sweep: removes what is over, and sees to the folders for temporary files.
#include <fcntl.h>
#include <json/value.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>

#include "arguments.h"
#include "base/beneath.h"
#include "base/file.h"
#include "base/new_file.h"
#include "base/owner.h"
#include "command.h"
#include "folder_names.h"
#include "kept_store.h"
#include "operation/expiry.h"
#include "operation/undo_record.h"
#include "orvel/login_records.h"
#include "orvel/task_progress.h"
#include "search_task.h"
#include "text.h"
#include "tus/record.h"
#include "upload/spool.h"
#include "vexo/auto_block.h"
#include "vexo/index.h"
#include "vexo/sweep.h"
#include "vexo/system_root.h"
#include "vexo/task.h"
#include "vexo/volume.h"

namespace orvel::ctl {
namespace {

constexpr std::chrono::minutes kLongest{5};
constexpr time_t kResultsKept = time_t{2} * 24 * 60 * 60;  // as long as records of tasks
constexpr const char* kState = "/var/lib/vexo";
constexpr const char* kLinkSessions = "/tmp/foldersharing.current.users";
constexpr const char* kSearchRecord = "Quorvane_Search_";
constexpr std::string_view kJournal = "-journal";
constexpr std::string_view kUploads = "upload-";

struct Part {
    long removed = 0;
    std::string error = {};  // "" when it went well
};

// What the parts share.
struct Sweep {
    std::vector<std::string> volumes;  // those with their folders, once these were prepared
    std::chrono::steady_clock::time_point deadline = std::chrono::steady_clock::now() + kLongest;

    [[nodiscard]] bool isOver() const { return std::chrono::steady_clock::now() >= deadline; }
};

void addError(Part& part, const std::string& what, int error) {
    if (!part.error.empty()) part.error += "; ";
    part.error += what + ": " + strerror(error);
}

// Adds what an operation says it removed, -1 with errno for a failure.
void count(Part& part, const std::string& what, long removed) {
    if (removed < 0) return addError(part, what, errno);
    part.removed += removed;
}

Part prepareVolumes(Sweep& sweep) {
    struct Both {
        Part part;
        Sweep& sweep;
    } both{{}, sweep};
    const auto take = [](const VEXOVOLUMENOTE* note, void* argument) {
        auto& to = *static_cast<Both*>(argument);
        if (note->error != 0) {
            addError(to.part, note->folder, note->error);
        } else {
            to.sweep.volumes.emplace_back(note->volume);
        }
    };
    const bool done = VEXOVolumesPrepare(take, &both) == 0;
    // Without share definitions there are no volumes; the doctor says so.
    if (!done && both.part.error.empty() && errno != ENOENT) addError(both.part, "share definitions", errno);
    return both.part;
}

Part sweepSessions(Sweep& /*sweep*/) {
    Part part;
    count(part, "sessions", VEXOSessionsSweep());
    return part;
}

long linesOf(const std::string& file) {
    const std::unique_ptr<FILE, Releaser<fclose>> opened(fopen(file.c_str(), "re"));
    long lines = 0;
    for (int c = 0; opened != nullptr && (c = getc(opened.get())) != EOF;) lines += c == '\n' ? 1 : 0;
    return lines;
}

// A check of any session drops the records of those that have ended.
Part sweepLinkSessions(Sweep& /*sweep*/) {
    Part part;
    const std::string file = VEXO::SystemPath(kLinkSessions);
    if (access(file.c_str(), F_OK) != 0) return part;
    const long before = linesOf(file);
    setenv("REMOTE_ADDR", "127.0.0.1", 1);
    VEXO::WebCGI nobody;
    char user[256] = {};
    _tag_confirm_policy policy = {.flags = 0, .keepAccessTime = 0};
    errno = 0;
    constexpr int kFailed = -4;
    const int answer = IsAuthorizedByPath(&nobody, "", user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, "");
    if (answer == kFailed) addError(part, file, errno);
    part.removed = std::max(before - linesOf(file), 0L);
    return part;
}

Part sweepAutoBlock(Sweep& /*sweep*/) {
    Part part;
    count(part, "blocked addresses", VEXOAutoBlockSweep());
    return part;
}

Part sweepIndexes(Sweep& /*sweep*/) {
    Part part;
    count(part, "indexes", FILEIDXSweep());
    return part;
}

// Names of a user's records that begin with `prefix`. False, with the part's error, when they cannot be listed.
bool recordsOf(const std::string& user, const char* prefix, Json::Value& names, Part& part) {
    names = Json::Value(Json::arrayValue);
    if (KTR::TaskMgr(user.c_str()).getAllTaskId(prefix, names)) return true;
    addError(part, "tasks of " + user, errno);
    return false;
}

Part sweepTasks(Sweep& sweep) {
    Part part;
    Json::Value users(Json::arrayValue);
    if (!KTR::TaskMgr::getAllUsers(users)) addError(part, "tasks", errno);
    for (const Json::Value& user : users) {
        Json::Value before, after;
        if (sweep.isOver() || !recordsOf(user.asString(), "", before, part)) continue;
        if (before.empty()) continue;
        CleanTimeOutTasks(user.asCString());
        if (recordsOf(user.asString(), "", after, part) && after.size() < before.size()) {
            part.removed += before.size() - after.size();
        }
    }
    return part;
}

// Calls `each` for every folder in the folder `name` of each volume's temporary one, open, as users could have put
// something else there since. Users write in them: nothing is reached by a path.
template <class Each>
void forEachFolder(const Sweep& sweep, const std::string& name, Part& part, Each each) {
    for (const std::string& volume : sweep.volumes) {
        const Descriptor top(open(volume.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        const Descriptor folder = openBeneath(top, name, LinkPolicy::kNone, O_RDONLY | O_DIRECTORY);
        std::vector<std::string> names;
        if (!folder || !cgi::namesIn(folder.get(), cgi::Hidden::kInclude, names)) {
            addError(part, std::string(volume).append("/").append(name), errno);
            continue;
        }
        for (const std::string& one : names) {
            if (sweep.isOver()) return;
            const Descriptor inside = openBeneath(folder, one, LinkPolicy::kNone, O_RDONLY | O_DIRECTORY);
            if (inside) each(one, inside);
        }
    }
}

// Results that no record leads to any more.
Part sweepResults(Sweep& sweep) {
    Part part;
    forEachFolder(sweep, "@tmp/orvel/PXSearch", part, [&part](const std::string& user, const Descriptor& folder) {
        Json::Value records;
        std::vector<std::string> files;
        if (!recordsOf(user, kSearchRecord, records, part)) return;
        if (!cgi::namesIn(folder.get(), cgi::Hidden::kInclude, files)) return addError(part, user, errno);
        for (const std::string& file : files) {
            const bool journal = file.ends_with(kJournal);
            const std::string id = journal ? file.substr(0, file.size() - kJournal.size()) : file;
            const auto leads = [&](const Json::Value& record) { return record.asString() == kSearchRecord + id; };
            if (!cgi::isTaskId(id) || std::any_of(records.begin(), records.end(), leads)) continue;
            struct stat status {};
            if (fstatat(folder.get(), file.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
            if (!S_ISREG(status.st_mode) || status.st_mtime >= time(nullptr) - kResultsKept) continue;
            if (unlinkat(folder.get(), file.c_str(), 0) == 0 && !journal) ++part.removed;
        }
    });
    return part;
}

// What users' own stores keep for a time.
template <cgi::OwnSweep (*sweepStore)()>
Part sweepOwn(Sweep& /*sweep*/) {
    const cgi::OwnSweep swept = sweepStore();
    return {swept.removed, swept.error != 0 ? strerror(swept.error) : ""};
}

// What killed processes left, and bytes that no record leads to any more.
Part sweepUploads(Sweep& sweep) {
    Part part;
    const auto kept = cgi::keptUploadIds();
    if (!kept) addError(part, "unfinished uploads", errno);
    const auto isKept = [&kept](const std::string& id) { return !kept || kept->contains(id); };
    forEachFolder(sweep, "@tmp/orvel", part, [&part, &isKept](const std::string& name, const Descriptor& folder) {
        if (name.starts_with(kUploads)) count(part, name, cgi::removeAbandonedUploads(folder, isKept));
    });
    return part;
}

// Folders that killed processes were about to make for the system in `folder`, and, when `below`, in those that it has.
// Who is at work on one has it locked, or makes it again.
void sweepParts(const Descriptor& folder, const std::string& path, bool below, Part& part) {
    std::vector<std::string> names;
    if (!folder || !cgi::namesIn(folder.get(), cgi::Hidden::kInclude, names)) return addError(part, path, errno);
    for (const std::string& name : names) {
        struct stat status {};
        if (fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISDIR(status.st_mode))
            continue;
        if (isPartName(name)) {
            part.removed += removeAbandonedPart(folder.get(), name) ? 1 : 0;
        } else if (below) {
            const Descriptor inside = openBeneath(folder, name, LinkPolicy::kNone, O_RDONLY | O_DIRECTORY);
            sweepParts(inside, std::string(path).append("/").append(name), false, part);
        }
    }
}

Part sweepState(Sweep& /*sweep*/) {
    Part part;
    sweepParts(openFile(VEXO::SystemPath(kState), O_RDONLY | O_DIRECTORY | O_NOFOLLOW), kState, true, part);
    return part;
}

Part sweepBins(Sweep& sweep) {
    cgi::Expiry expiry = cgi::expireBins([&sweep] { return sweep.isOver(); });
    return {expiry.removed, std::move(expiry.error)};
}

// All that is swept. What grows by itself and is not here: the file of guesses has a fixed size; parts of killed work
// in users' own folders are hidden and go when the same name is wanted again; logs belong to logrotate.
constexpr struct {
    const char* name;
    const char* what;  // that was removed
    Part (*run)(Sweep& sweep);
} kParts[] = {
    {"volumes", "prepared", prepareVolumes},  // first: others go through its volumes
    {"sessions", "ended", sweepSessions},
    {"link sessions", "ended", sweepLinkSessions},
    {"blocked addresses", "over", sweepAutoBlock},
    {"tasks", "older than two days", sweepTasks},
    {"search results", "without a task", sweepResults},  // behind the tasks
    {"unfinished uploads", "at rest for two days", sweepOwn<cgi::sweepUploadRecords>},
    {"uploads", "left by killed processes", sweepUploads},  // behind their records
    {"indexes", "left by killed builds", sweepIndexes},
    {"kept listings", "at rest for an hour", sweepOwn<cgi::sweepKeptListings>},
    {"undo records", "older than two days", sweepOwn<cgi::sweepUndoRecords>},
    {"hidden folders", "left by killed processes", sweepState},
    {"recycle bins", "beyond their days or size", sweepBins},  // last: it may take long
};

Json::Value jsonOf(const char* name, const Part& part) {
    Json::Value value;
    value["name"] = name;
    value["removed"] = static_cast<Json::Int64>(part.removed);
    if (!part.error.empty()) value["error"] = cgi::readable(part.error);
    return value;
}

}  // namespace

int sweep(const std::vector<std::string>& words) {
    const Arguments arguments(words, "sweep", "", 0);
    const bool json = arguments.has("--json"), quiet = arguments.has("--quiet");
    const int handle = VEXOSweepBegin();
    if (handle < 0) {
        const bool busy = errno == ETIMEDOUT;
        if (!quiet || !busy) {
            fprintf(stderr, "orvelctl: %s\n", busy ? "another sweep is at work" : strerror(errno));
        }
        return busy ? 0 : 1;
    }
    Sweep sweep;
    Json::Value all(Json::arrayValue);
    int failures = 0;
    for (const auto& row : kParts) {
        Part part;
        if (!sweep.isOver()) part = row.run(sweep);
        if (sweep.isOver()) addError(part, "broken off", ETIMEDOUT);
        if (!part.error.empty()) {
            ++failures;
            fprintf(stderr, "orvelctl: %s: %s\n", row.name, terminalText(part.error).c_str());
        }
        if (json) all.append(jsonOf(row.name, part));
        if (!json && !quiet && part.removed > 0) printf("%s: %ld %s\n", row.name, part.removed, row.what);
    }
    const bool noted = VEXOSweepEnd(handle, failures) == 0;
    if (!noted) fprintf(stderr, "orvelctl: the sweep could not be noted: %s\n", strerror(errno));
    if (json) {
        Json::Value report;
        report["failures"] = failures;
        report["swept"] = std::move(all);
        std::string text;
        cgi::appendJson(report, text);
        printf("%s\n", text.c_str());
    }
    return failures == 0 && noted ? 0 : 1;
}

}  // namespace orvel::ctl
