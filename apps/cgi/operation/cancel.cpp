#include "operation/operation.h"
#include "operation/task_reply.h"
#include "orvel/error_state.h"
#include "orvel/task_progress.h"

namespace orvel::cgi {

int cancelOperation(Operation& operation) {
    const auto task = taskOf(operation);
    if (task == nullptr) return ORV_ERR_MISSING;
    // A process that merely has the same number is not ours.
    const pid_t worker = task->isFinished() ? 0 : task->getWorker();
    if (worker > 0 && !DoKill(worker) && task->getWorker() > 0) return ORV_ERR_GENERAL;
    task->reload();
    operation.data = taskReply(*task);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
