#include "operation/operation.h"
#include "operation/task_reply.h"
#include "orvel/error_state.h"
#include "search_task.h"

namespace orvel::cgi {
namespace {

int clearOne(Operation& operation) {
    const auto task = taskOf(operation);
    if (task == nullptr) return ORV_ERR_MISSING;
    if (!task->isFinished()) return ORV_ERR_BUSY;
    if (!task->remove()) return ORV_ERR_GENERAL;
    operation.data["cleared"] = 1;
    return ORV_ERR_NONE;
}

}  // namespace

int clearOperation(Operation& operation) {
    const char* user = operation.user.name.c_str();
    static_cast<void>(makeRoomForTask(user));  // old ones go, whatever is asked for
    if (operation.web.HasParam("taskid")) return clearOne(operation);
    std::vector<std::unique_ptr<KTR::Task>> tasks;
    if (!tasksOf(operation.user.name, tasks)) return ORV_ERR_GENERAL;
    int cleared = 0;
    for (const auto& task : tasks) {
        if (task->isFinished() && task->remove()) ++cleared;
    }
    operation.data["cleared"] = cleared;
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
