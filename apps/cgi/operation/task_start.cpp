#include "operation/task_start.h"

#include <sys/resource.h>

#include <algorithm>
#include <memory>

#include "background.h"
#include "base/random.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "search_task.h"
#include "vexo/error.h"

namespace orvel::cgi {
namespace {

constexpr rlim_t kMostDescriptors = 16384;  // two for each level of a tree

void allowDeepTrees() {
    rlimit limit{};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
    limit.rlim_cur = std::max(limit.rlim_cur, std::min(limit.rlim_max, kMostDescriptors));
    setrlimit(RLIMIT_NOFILE, &limit);
}

// The process of the work: it begins once its record shows it and who asked for it knows.
int runInBackground(KTR::Task& task, const std::string& user, const std::string& action,
                    const std::function<void(Progress&)>& work, const Begun& begun) {
    Progress progress(task, user, action);
    const bool recorded = task.attach() && progress.publish();
    const bool heard = begun(recorded ? ORV_ERR_NONE : platformCode());
    if (!heard) task.remove();  // nobody waits for it, nobody would look for it
    if (!heard || !recorded) return 1;
    allowDeepTrees();
    work(progress);
    progress.end();
    return 0;
}

}  // namespace

std::string newTaskId(const std::string& action) {
    const std::string drawn = draw<8>();
    return drawn.empty() ? "" : kTaskPrefix + action + "_" + drawn;
}

int startTask(Operation& operation, const std::string& action, const std::function<void(Progress&)>& work) {
    const char* user = operation.user.name.c_str();
    const int code = makeRoomForTask(user);
    if (code != ORV_ERR_NONE) return code;
    const std::string id = newTaskId(action);
    KTR::TaskMgr manager(user);
    const std::unique_ptr<KTR::Task> task(id.empty() ? nullptr : manager.createTask(id.c_str()));
    if (task == nullptr) return OrvParseVexoErrToError(VLIBCErrGet(), nullptr);
    const int failure =
        startBackground([&](const Begun& begun) { return runInBackground(*task, user, action, work, begun); });
    if (failure != ORV_ERR_NONE) {
        task->remove();
        return failure;
    }
    operation.data["taskid"] = id;
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
