#include <json/value.h>
#include <syslog.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <ctime>
#include <memory>

#include "core/boundary.h"
#include "orvel/task_progress.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelprogress";
constexpr const char* kPrefix = "Quorvane_";
constexpr unsigned long long kKept = 172799;  // seconds

// How far apart two times are, whatever a record claims.
unsigned long long distance(long long a, long long b) {
    const auto first = static_cast<unsigned long long>(a), second = static_cast<unsigned long long>(b);
    return a > b ? first - second : second - first;
}

bool sweep(const char* owner) {
    KTR::TaskMgr manager(owner);
    const long long now = time(nullptr);
    Json::Value names(Json::arrayValue);
    manager.getAllTaskId(kPrefix, names);
    for (const Json::Value& name : names) {
        const std::unique_ptr<KTR::Task> task(manager.getTask(name.asCString()));
        if (task == nullptr) continue;
        if (task->isFinished() && distance(task->getCreateTime(), now) > kKept) task->remove();
    }
    return true;
}

}  // namespace
}  // namespace orvel

void CleanTimeOutTasks(const char* owner) {
    orvel::guardedQuietly(false, [&] { return orvel::sweep(owner); });
}

bool DoKill(int pid) {
    if (pid < 1) {
        syslog(LOG_ERR, "invalid process id");
        return false;
    }
    if (kill(pid, SIGTERM) == 0) return true;
    const int error = errno;
    if (error != ESRCH) {
        syslog(LOG_ERR, "%s (%d) Failed to kill %d, reason=%s(%d)", orvel::kSource, __LINE__, pid, strerror(error),
               error);
    }
    return false;
}
