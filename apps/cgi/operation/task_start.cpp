#include "operation/task_start.h"

#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>

#include "background.h"
#include "base/random.h"
#include "orvel/error_state.h"
#include "orvel/task_progress.h"
#include "search_task.h"
#include "vexo/error.h"

namespace orvel::cgi {
namespace {

constexpr unsigned kPatience = 1000;        // ten seconds, as waits are counted
constexpr rlim_t kMostDescriptors = 16384;  // two for each level of a tree

struct Background {
    KTR::Task& task;
    const std::string& action;
    const std::function<void(Progress&)>& work;
};

// "" with errno when the kernel gives no random bytes.
std::string newTaskId(const std::string& action) {
    const std::string drawn = draw<8>();
    return drawn.empty() ? "" : kTaskPrefix + action + "_" + drawn;
}

void allowDeepTrees() {
    rlimit limit{};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
    limit.rlim_cur = std::max(limit.rlim_cur, std::min(limit.rlim_max, kMostDescriptors));
    setrlimit(RLIMIT_NOFILE, &limit);
}

int runInBackground(void* arg) {
    const auto& background = *static_cast<Background*>(arg);
    if (!background.task.attach()) return 1;
    Progress progress(background.task, background.action);
    if (!progress.publish()) return 1;
    allowDeepTrees();
    background.work(progress);
    progress.end();
    return 0;
}

}  // namespace

int startTask(Operation& operation, const std::string& action, const std::function<void(Progress&)>& work) {
    const char* user = operation.user.name.c_str();
    const int code = makeRoomForTask(user);
    if (code != ORV_ERR_NONE) return code;
    const std::string id = newTaskId(action);
    KTR::TaskMgr manager(user);
    const std::unique_ptr<KTR::Task> task(id.empty() ? nullptr : manager.createTask(id.c_str()));
    if (task == nullptr) return OrvParseVexoErrToError(VLIBCErrGet(), nullptr);
    Background background = {.task = *task, .action = action, .work = work};
    if (startBackground(runInBackground, &background) < 0) {
        const int reason = OrvParseErrnoToError(errno, nullptr, nullptr);
        task->remove();
        return reason;
    }
    operation.data["taskid"] = id;
    return WaitForMgrTaskDataReady(&manager, id.c_str(), "data", kPatience) ? ORV_ERR_NONE : ORV_ERR_GENERAL;
}

}  // namespace orvel::cgi
