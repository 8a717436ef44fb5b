#include "operation/operation.h"
#include "operation/task_start.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

void run(Operation& operation, Progress& progress) {
    Choice& chosen = operation.chosen;
    chosen.reportNew(operation.user, progress);
    for (size_t i = 0; i < chosen.size() && !progress.stopped(); ++i) {
        Item item;
        const int code = chosen.open(operation.user, i, {Need::kList}, item);
        if (code != ORV_ERR_NONE) {
            progress.failed(chosen.path(i), code);
            continue;
        }
        progress.begin(item.info.path);
        measure(item, progress);
        progress.done();
    }
}

}  // namespace

int measureOperation(Operation& operation) {
    return startTask(operation, "measure", [&](Progress& progress) { run(operation, progress); });
}

}  // namespace orvel::cgi
