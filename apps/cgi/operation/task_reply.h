// A task as replies show it.
#ifndef ORVEL_CGI_OPERATION_TASK_REPLY_H
#define ORVEL_CGI_OPERATION_TASK_REPLY_H

#include <json/value.h>

#include <memory>
#include <string>
#include <vector>

#include "operation/operation.h"
#include "vexo/task.h"

namespace orvel::cgi {

// {"taskid","created","progress","finished"} with the members of its "data" beside them. A task whose process ended
// without a last word is shown as "failed". Side effect: the record of one that has ended is read anew.
Json::Value taskReply(KTR::Task& task);

// The background operation "taskid" of the user, null when he has no such one; and all of them, false when they cannot
// be listed. Searches have records of the same kind, but are no operations.
std::unique_ptr<KTR::Task> taskOf(const Operation& operation);
bool tasksOf(const std::string& user, std::vector<std::unique_ptr<KTR::Task>>& tasks);
// All of them: {"tasks":[...]}.
bool tasksReply(const std::string& user, Json::Value& data);

}  // namespace orvel::cgi

#endif
