#include "search_task.h"

#include <json/value.h>
#include <poll.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdint>
#include <ctime>
#include <map>
#include <tuple>
#include <utility>
#include <vector>

#include "base/descriptor.h"
#include "orvel/error_state.h"
#include "request.h"
#include "vexo/settings.h"

namespace orvel::cgi {
namespace {

constexpr const char* kAnyTask = "Quorvane_";
constexpr const char* kPrefix = "Quorvane_Search_";
constexpr size_t kMostRunning = 32;   // of one user
constexpr size_t kMostRecords = 200;  // each start reads all of them
constexpr std::uint64_t kUsualMiB = 1024, kMostMiB = std::uint64_t{1} << 30;
constexpr size_t kLongestId = 16;  // two numbers of 32 bits
// A minute less than CleanTimeOutTasks keeps their records: without those nobody would find the results any more.
constexpr unsigned long long kKept = 2ULL * 24 * 60 * 60 - 60;
constexpr int kPatience = 2000;  // milliseconds

// The C library's own declarations lack C linkage in some of its versions.
Descriptor openProcess(pid_t process) {
    return Descriptor(process > 0 ? static_cast<int>(syscall(SYS_pidfd_open, process, 0)) : -1);
}

void send(const Descriptor& process, int signal) {
    syscall(SYS_pidfd_send_signal, process.get(), signal, nullptr, 0);
}

bool hasEnded(const Descriptor& process, int milliseconds) {
    pollfd watched = {process.get(), POLLIN, 0};
    return poll(&watched, 1, milliseconds) == 1;
}

// A time as far in the future counts, too; it is what a record claims.
bool isOld(long long created) {
    const long long now = time(nullptr);
    const auto a = static_cast<unsigned long long>(now), b = static_cast<unsigned long long>(created);
    return (now > created ? a - b : b - a) >= kKept;
}

struct Ended {
    long long created = 0;
    std::string name, volume;
    std::int64_t bytes = 0;  // of a search: what its results take of the volume
};

Ended endedOf(const std::string& user, const std::string& name, KTR::Task& task) {
    Ended ended = {.created = task.getCreateTime(), .name = name, .volume = {}};
    const Json::Value volume = task.getProperty(kVolumeProperty);
    const std::string prefix = kPrefix;
    if (!volume.isString() || !name.starts_with(prefix)) return ended;
    ended.volume = volume.asString();
    const std::string file = FileSearch::OrvSearchDBTask::getDBTaskFilePath(ended.volume.c_str(), user.c_str(),
                                                                            name.substr(prefix.size()).c_str());
    struct stat status {};
    if (!file.empty() && stat(file.c_str(), &status) == 0) ended.bytes = status.st_size;
    return ended;
}

// Half of the room that the platform gives a user's results on a volume, so that a new search finds as much.
std::int64_t mostKeptBytes() {
    const auto mib = parseNumber(VexoConf::Info().Get("search_results_mib", ""));
    return static_cast<std::int64_t>(std::min<std::uint64_t>(mib.value_or(kUsualMiB), kMostMiB)) << 19;
}

// Removes the record and, of a search, its results.
void removeEnded(const std::string& user, const std::string& name) {
    const std::string prefix = kPrefix;
    SearchTask task;
    if (name.starts_with(prefix) && isTaskId(name.substr(prefix.size()))) {
        if (findTask(user, name.substr(prefix.size()), task) == ORV_ERR_NONE) removeTask(task);
        return;
    }
    const std::unique_ptr<KTR::Task> record(KTR::TaskMgr(user.c_str()).getTask(name.c_str()));
    if (record != nullptr) record->remove();
}

}  // namespace

bool isTaskId(const std::string& text) {
    return !text.empty() && text.size() <= kLongestId &&
           text.find_first_not_of("0123456789ABCDEF") == std::string::npos;
}

int findTask(const std::string& user, const std::string& id, SearchTask& task) {
    task.record.reset(KTR::TaskMgr(user.c_str()).getTask((kPrefix + id).c_str()));
    if (task.record == nullptr) return ORV_ERR_MISSING;
    const Json::Value volume = task.record->getProperty(kVolumeProperty);
    if (volume.isString()) {
        task.results.reset(FileSearch::OrvSearchDBTaskMgr(user.c_str()).getDBTask(volume.asCString(), id.c_str()));
    }
    return ORV_ERR_NONE;
}

std::unique_ptr<KTR::Task> makeRecord(const std::string& user, const std::string& id) {
    return std::unique_ptr<KTR::Task>(KTR::TaskMgr(user.c_str()).createTask((kPrefix + id).c_str()));
}

bool endWork(KTR::Task& record, bool forGood) {
    const pid_t worker = record.getWorker();
    const Descriptor process = openProcess(worker);
    // The number may have gone to another process before the descriptor was opened, but not after.
    if (!process || record.getWorker() != worker) return true;
    send(process, SIGTERM);
    if (hasEnded(process, kPatience)) return true;
    if (!forGood) return false;
    send(process, SIGKILL);
    return hasEnded(process, kPatience);
}

bool removeTask(const SearchTask& task) {
    if (task.results != nullptr) {
        const std::string file = task.results->getDBTaskFilePath();
        task.results->remove();
        unlink((file + "-journal").c_str());  // what a killed process left
    }
    return task.record->remove();
}

int makeRoomForTask(const std::string& user) {
    KTR::TaskMgr manager(user.c_str());
    Json::Value names(Json::arrayValue);
    if (!manager.getAllTaskId(kAnyTask, names)) return ORV_ERR_NONE;
    size_t running = 0;
    std::vector<Ended> ended;
    for (const Json::Value& name : names) {
        const std::unique_ptr<KTR::Task> task(manager.getTask(name.asCString()));
        if (task == nullptr) continue;
        if (!task->isFinished()) {
            ++running;
        } else if (isOld(task->getCreateTime())) {
            removeEnded(user, name.asString());
        } else {
            ended.push_back(endedOf(user, name.asString(), *task));
        }
    }
    const auto age = [](const Ended& one) { return std::tie(one.created, one.name); };
    std::sort(ended.begin(), ended.end(), [&](const Ended& a, const Ended& b) { return age(a) < age(b); });
    std::map<std::string, std::int64_t> kept;
    for (const Ended& one : ended) kept[one.volume] += one.bytes;
    const size_t all = ended.size() + running;
    const size_t tooMany = all < kMostRecords ? 0 : std::min(all - kMostRecords + 1, ended.size());
    const std::int64_t most = mostKeptBytes();
    for (size_t i = 0; i < ended.size(); ++i) {
        std::int64_t& bytes = kept[ended[i].volume];
        if (i >= tooMany && (ended[i].bytes == 0 || bytes <= most)) continue;
        removeEnded(user, ended[i].name);
        bytes -= ended[i].bytes;
    }
    return running < kMostRunning ? ORV_ERR_NONE : ORV_ERR_BUSY;
}

}  // namespace orvel::cgi
