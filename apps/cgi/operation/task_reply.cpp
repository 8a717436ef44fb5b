#include "operation/task_reply.h"

#include <cctype>
#include <utility>

#include "operation/size_report.h"
#include "operation/task_start.h"

namespace orvel::cgi {
namespace {

// Operations have names in lower case, searches have not.
bool isOperation(const std::string& id) {
    const std::string prefix = kTaskPrefix;
    return id.starts_with(prefix) && id.size() > prefix.size() &&
           std::islower(static_cast<unsigned char>(id[prefix.size()])) != 0;
}

}  // namespace

Json::Value taskReply(KTR::Task& task) {
    // What was read while it was still at work is not its last word.
    const bool finished = task.isFinished();
    if (finished) task.reload();
    const Json::Value data = task.getProperty("data");
    Json::Value shown = data.isObject() ? data : Json::Value(Json::objectValue);
    shown["taskid"] = task.getName();
    shown["created"] = Json::Int64{task.getCreateTime()};
    const Json::Value progress = task.getProperty("progress");
    shown["progress"] = progress.isDouble() ? progress : Json::Value(0.0);
    shown["finished"] = finished;
    if (task.hasFailed() && (!shown["state"].isString() || shown["state"] == "running")) shown["state"] = "failed";
    return shown;
}

std::unique_ptr<KTR::Task> taskOf(const Operation& operation) {
    const std::string id = operation.web.GetParam("taskid", "");
    if (!isOperation(id)) return nullptr;
    return std::unique_ptr<KTR::Task>(KTR::TaskMgr(operation.user.name.c_str()).getTask(id.c_str()));
}

bool tasksOf(const std::string& user, std::vector<std::unique_ptr<KTR::Task>>& tasks) {
    const KTR::TaskMgr manager(user.c_str());
    Json::Value names(Json::arrayValue);
    if (!manager.getAllTaskId(kTaskPrefix, names)) return false;
    for (const Json::Value& name : names) {
        if (!isOperation(name.asString())) continue;
        std::unique_ptr<KTR::Task> task(manager.getTask(name.asCString()));
        if (task != nullptr) tasks.push_back(std::move(task));
    }
    return true;
}

bool tasksReply(const std::string& user, Json::Value& data) {
    std::vector<std::unique_ptr<KTR::Task>> tasks;
    if (!tasksOf(user, tasks)) return false;
    data["tasks"] = Json::Value(Json::arrayValue);
    for (const auto& task : tasks) {
        Json::Value shown = taskReply(*task);
        if (shown.isMember("measured")) leaveOutLists(shown["measured"]);
        data["tasks"].append(shown);
    }
    return true;
}

}  // namespace orvel::cgi
