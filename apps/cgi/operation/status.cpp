#include "operation/operation.h"
#include "operation/task_reply.h"
#include "orvel/error_state.h"

namespace orvel::cgi {

int statusOperation(Operation& operation) {
    if (operation.web.HasParam("taskid")) {
        const auto task = taskOf(operation);
        if (task == nullptr) return ORV_ERR_MISSING;
        operation.data = taskReply(*task);
        return ORV_ERR_NONE;
    }
    return tasksReply(operation.user.name, operation.data) ? ORV_ERR_NONE : ORV_ERR_GENERAL;
}

}  // namespace orvel::cgi
