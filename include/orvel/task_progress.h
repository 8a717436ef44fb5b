// Progress of background operations: what an operation publishes in its task record, how a request waits for it, and
// how both come to an end.
//
// Waits are counted, not timed: a counter grows by 10 with every pause of 100 ms, so a limit of L allows about L x 10
// milliseconds (kept: callers count with it). None of these functions sets a library code. Task names and property
// names are bytes, null ends a wait like a name that is never there.
#ifndef ORVEL_TASK_PROGRESS_H
#define ORVEL_TASK_PROGRESS_H

#include <json/forwards.h>

#include "orvel/export.h"
#include "vexo/task.h"

// Publishes the properties "progress" (`progress` as a real number) and "data" (any value) of `task` in one update: a
// reader sees both change together. True when written; false, logged, with the record as it was, when not, and for a
// null task. A number that is not finite, and data that would make the record unreadable (see vexo/task.h), are not
// written.
ORVEL_API bool SaveTaskData(KTR::Task* task, const Json::Value& data, float progress);

// Waits until the property of `task` is not null. False for a null task, for a `limit` of 0 at once, and when the
// counter has reached `limit`; after the last pause there is no last look (kept). Side effect: the record is read anew.
ORVEL_API bool WaitForTaskDataReady(KTR::Task* task, const char* property, unsigned limit);

// As above; a property that is null when first looked at also counts once it has a member `key`.
ORVEL_API bool WaitForTaskDataKeyReady(KTR::Task* task, const char* property, const char* key, unsigned limit);

// Waits until the task `name` exists, then for its property with the full `limit` once more (kept). A null `manager`
// waits out the limit.
ORVEL_API bool WaitForMgrTaskDataReady(KTR::TaskMgr* manager, const char* name, const char* property, unsigned limit);

// Removes the records of `owner` whose names begin with "Quorvane_", that are finished (or whose process ended without
// finishing) and were made two days ago or earlier, or will be made in two days or later. Whatever cannot be read or
// removed stays.
ORVEL_API void CleanTimeOutTasks(const char* owner);

// Asks the process `pid` to end (SIGTERM). True when it was asked; false for a number below 1 and for a failure, both
// logged, and, without a log line, for a process that is gone. Whether it is the process that was meant is the caller's
// to know (KTR::Task::getWorker).
ORVEL_API bool DoKill(int pid);

#endif
