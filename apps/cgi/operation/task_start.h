// From a request to a background process with a task record.
#ifndef ORVEL_CGI_OPERATION_TASK_START_H
#define ORVEL_CGI_OPERATION_TASK_START_H

#include <functional>
#include <string>

#include "operation/operation.h"
#include "operation/progress.h"

namespace orvel::cgi {

// Task identifiers of the operations begin so; what follows is the action and a random number.
inline constexpr const char* kTaskPrefix = "Quorvane_";

// "" with errno when the kernel gives no random bytes.
std::string newTaskId(const std::string& action);

// Goes on with `work` in a background process that publishes its progress, and puts the task's identifier into `data`
// ("taskid") once the record shows that the process lives. What `work` refers to must be copied into it or outlive this
// call. 0 or a library code, at once even if that process ended early; then there is no record.
int startTask(Operation& operation, const std::string& action, const std::function<void(Progress&)>& work);

}  // namespace orvel::cgi

#endif
