#include <json/value.h>
#include <syslog.h>

#include <cerrno>
#include <ctime>
#include <memory>

#include "core/boundary.h"
#include "orvel/task_progress.h"

namespace orvel {
namespace {

constexpr unsigned kStep = 10;  // what one pause counts
constexpr long kPause = 100L * 1000 * 1000;

// Counts the pauses of a wait; wider than the limits, so that it always comes to its end.
using Counter = unsigned long long;

void pause() {
    timespec rest{0, kPause};
    while (nanosleep(&rest, &rest) != 0 && errno == EINTR) {
    }
}

bool save(KTR::Task& task, const Json::Value& data, float progress) {
    // Where no update can begin there may be one of the caller's, which is not to be ended here.
    if (task.beginUpdate()) {
        const bool set =
            task.setProperty("progress", Json::Value(static_cast<double>(progress))) && task.setProperty("data", data);
        if (task.endUpdate() && set) return true;
    }
    syslog(LOG_ERR, "Failed to write progress.");
    return false;
}

// Looks (each time at a record read anew) and pauses until `isReady` or the counter has reached the limit.
template <class Look>
bool waitFor(KTR::Task* task, unsigned limit, Look&& isReady) {
    if (task == nullptr || limit == 0) return false;
    Counter counter = 0;
    do {
        task->reload();
        if (isReady()) return true;
        pause();
        counter += kStep;
    } while (counter < limit);
    return false;
}

bool hasMember(const Json::Value& value, const char* key) {
    return key != nullptr && value.isObject() && value.isMember(key);
}

bool waitForTask(KTR::TaskMgr* manager, const char* name, const char* property, unsigned limit) {
    Counter counter = 0;
    while (counter < limit) {
        counter += kStep;
        if (manager != nullptr && manager->hasTask(name)) {
            const std::unique_ptr<KTR::Task> task(manager->getTask(name));
            return WaitForTaskDataReady(task.get(), property, limit);
        }
        pause();
    }
    return false;
}

}  // namespace
}  // namespace orvel

bool SaveTaskData(KTR::Task* task, const Json::Value& data, float progress) {
    return orvel::guardedQuietly(false, [&] { return task != nullptr && orvel::save(*task, data, progress); });
}

bool WaitForTaskDataReady(KTR::Task* task, const char* property, unsigned limit) {
    return orvel::guardedQuietly(
        false, [&] { return orvel::waitFor(task, limit, [&] { return !task->getProperty(property).isNull(); }); });
}

bool WaitForTaskDataKeyReady(KTR::Task* task, const char* property, const char* key, unsigned limit) {
    return orvel::guardedQuietly(false, [&] {
        return orvel::waitFor(task, limit, [&] {
            return !task->getProperty(property).isNull() || orvel::hasMember(task->getProperty(property), key);
        });
    });
}

bool WaitForMgrTaskDataReady(KTR::TaskMgr* manager, const char* name, const char* property, unsigned limit) {
    return orvel::guardedQuietly(false, [&] { return orvel::waitForTask(manager, name, property, limit); });
}
