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
    std::vector<std::unique_ptr<KTR::Task>> tasks;
    if (!tasksOf(operation, tasks)) return ORV_ERR_GENERAL;
    operation.data["tasks"] = Json::Value(Json::arrayValue);
    for (const auto& task : tasks) operation.data["tasks"].append(taskReply(*task));
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
